#pragma once

#include "host/DriverTable.hpp"

#include <cstdint>

/// Segment number of a segment type (1 for the five types offered), -1 when
/// the type has no further segment after previous.
int32_t FindSegmentNumber(int32_t segmentType, int32_t previous);
/// Writes the description of a segment type into buffer (81 bytes); other
/// object types leave it untouched.
void DescribeSegmentObject(int32_t objectType, int32_t objectNumber,
                           char *buffer);
int32_t OpenTextSegment(FILE *handle, TextCursor *cursor, const char *access,
                        int32_t value);
/// Writes the next line of the product description into buffer; 1 when a
/// line was written, 0 at the end.
int32_t ReadTextLine(TextCursor *cursor, char *buffer, int32_t length);
