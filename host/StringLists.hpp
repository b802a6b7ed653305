#pragma once

// Host string lists: a null-terminated array of malloc'ed texts; null is the
// empty list. Every call that changes a list returns the list to use from then
// on (the old pointer may be gone) and keeps its own copies of the texts.
// A list is released with DestroyStringList.
//
// Key/value entries are list texts of the form "KEY: VALUE" (key, colon, one
// space, value). Keys match exactly, case-sensitively.

/// Number of texts in the list (0 for null).
int CountStringList(char *const *list);
/// Appends a copy of text (an empty text for null).
char **AddStringToList(char **list, const char *text);
/// Appends copies of every text of other.
char **AddStringList(char **list, char *const *other);
/// Releases the list and its texts; null is allowed.
void DestroyStringList(char **list);
/// A deep copy (null for an empty list); the caller destroys it.
char **DuplicateStringList(char *const *list);
/// The lines of a text file without their terminators ("\n" or "\r\n"), or
/// null when the file cannot be read. A readable empty file gives a list with
/// no texts that is not null. The caller destroys the list.
char **TextFileToStringList(const char *path);

/// "KEY: VALUE" in a host-owned MkName buffer; callers never free it.
const char *MakeAuxEntry(const char *key, const char *value);
/// Replaces the value of the first entry of key, or appends a new entry.
/// Later entries of the same key stay as they are (FetchAuxEntry never sees
/// them).
char **SetAuxEntry(char **list, const char *key, const char *value);
/// The value of the first entry of key, pointing into the list (not a copy),
/// or null when there is none.
const char *FetchAuxEntry(char *const *list, const char *key);
/// Removes entries of key: every one of them when all is non-zero, otherwise
/// only those whose value equals value (null reads as ""). The list shrinks in
/// place: the returned pointer is list itself, possibly holding no texts.
char **DeleteAuxEntries(char **list, const char *key, const char *value,
                        int all);

/// Non-zero when a regular file exists at path (a folder gives 0).
int DKCheck(const char *path);
