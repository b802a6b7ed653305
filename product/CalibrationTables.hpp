#pragma once

#include <memory>

#include <xercesc/dom/DOMDocument.hpp>

class LookupTable;
class ZirOdi2CalibImage;

/// Loads the look-up table of the kind option names ("sigma", "beta",
/// "gamma") into the model's calibration table and records its kind; without
/// a usable table, reports a warning and sets the kind to "None".
void LoadCalibration(const xercesc::DOMDocument *document,
                     ZirOdi2CalibImage *model, const char *option);
/// Full path of the table file whose lookupTable attribute contains pattern
/// (any case), as a host string the caller frees; null when none matches.
char *FindLookupTableFile(const xercesc::DOMDocument *document,
                          const ZirOdi2CalibImage *model, const char *pattern);
/// As FindLookupTableFile (pattern "Sigma Nought" when null), and records the
/// matched attribute value as the model's calibration type.
char *SelectCalibrationFile(const xercesc::DOMDocument *document,
                            ZirOdi2CalibImage *model, const char *pattern);
/// The table file at path, or null when it yields no document.
std::unique_ptr<LookupTable> ReadLookupTableFile(const char *path);
enum class IncidenceFormula { Detected, Complex };
/// Fills the model's incidence table from the Sigma and Beta tables.
void ReadIncidenceAngles(const xercesc::DOMDocument *document,
                         ZirOdi2CalibImage *model, IncidenceFormula formula);
/// Entries ":Calibration Type:<kind>" for the kinds the product at path
/// offers, "None" last; a new host list, or null when path yields no
/// document.
char **ListCalibrationTypes(const char *path);
