#pragma once

#include "model/LookupTable.hpp"

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include <xercesc/dom/DOMDocument.hpp>

class ZirOdi2CalibImage;

/// The look-up table files read while one product loads, by path. The
/// calibration and the incidence angles may need the same file (the Sigma
/// table for the option "sigma"), which is then parsed once.
class LookupTableFiles {
  public:
    /// The table of the file at path as ReadLookupTableFile gives it, read
    /// on the first request for that path; null for a null path and for a
    /// file that yields no table.
    const LookupTable *Read(const char *path);
    /// Whether a table file name of product.xml may be read from the
    /// product folder directory: a name that leads out of the folder, by
    /// itself or through a symbolic link, or names no regular file, is
    /// refused, with a warning naming it the first time this load meets it
    /// (the calibration and the incidence angles may both ask for it). A
    /// missing file is admitted, for the loading to report as missing.
    bool Admits(const char *directory, const char *name);

  private:
    std::vector<std::pair<std::string, std::unique_ptr<LookupTable>>> tables;
    std::vector<std::string> refusedNames;
};

/// Loads the look-up table of the kind option names ("sigma", "beta",
/// "gamma") into the model's calibration table and records its kind; without
/// a usable table, reports a warning and sets the kind to "None".
void LoadCalibration(const xercesc::DOMDocument *document,
                     ZirOdi2CalibImage *model, const char *option);
/// As above, reading the table file through files.
void LoadCalibration(const xercesc::DOMDocument *document,
                     ZirOdi2CalibImage *model, const char *option,
                     LookupTableFiles &files);
/// Full path of the table file whose lookupTable attribute contains pattern
/// (any case), as a host string the caller frees; null when none matches,
/// and when its file name leads out of the product folder (after a warning
/// naming it: such a table is taken as missing).
char *FindLookupTableFile(const xercesc::DOMDocument *document,
                          const ZirOdi2CalibImage *model, const char *pattern);
/// As above, with the names refused while one product loads reported once.
char *FindLookupTableFile(const xercesc::DOMDocument *document,
                          const ZirOdi2CalibImage *model, const char *pattern,
                          LookupTableFiles &files);
/// As FindLookupTableFile (pattern "Sigma Nought" when null), and records the
/// matched attribute value as the model's calibration type when it gives a
/// path.
char *SelectCalibrationFile(const xercesc::DOMDocument *document,
                            ZirOdi2CalibImage *model, const char *pattern,
                            LookupTableFiles &files);
/// The table file at path, or null when it yields no document with a root
/// element and a gains element (no XML, cut short before its gains, or
/// without gains).
std::unique_ptr<LookupTable> ReadLookupTableFile(const char *path);
enum class IncidenceFormula { Detected, Complex };
/// Fills the model's incidence table from the Sigma and Beta tables.
void ReadIncidenceAngles(const xercesc::DOMDocument *document,
                         ZirOdi2CalibImage *model, IncidenceFormula formula);
/// As above, reading the table files through files.
void ReadIncidenceAngles(const xercesc::DOMDocument *document,
                         ZirOdi2CalibImage *model, IncidenceFormula formula,
                         LookupTableFiles &files);
/// Entries ":Calibration Type:<kind>" for the kinds the product at path
/// offers, "None" last; a new host list, or null when path yields no
/// document.
char **ListCalibrationTypes(const char *path);

/// The calibration types a description offers, in the order the list of
/// ListCalibrationTypes gives them: "Sigma Nought" first when a table of
/// that kind is listed, the other kinds in document order, "None" last.
std::vector<std::string>
CalibrationTypeNames(const xercesc::DOMDocument *document);
