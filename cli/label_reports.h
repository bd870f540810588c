// Reports in the formats of other programs: spreadsheets, label editors, diarisation tools.
#pragma once

#include <memory>

#include "cli/report.h"

namespace orvalis::cli {

/// RFC 4180 without the carriage returns: a header, then a line for each finding of all files.
std::unique_ptr<Report> make_csv_report();

/// A label track as Audacity imports it: start, end and label, separated by tabs.
std::unique_ptr<Report> make_labels_report();

/// A Praat TextGrid in the long text format: one interval tier, "speech" where there is an
/// utterance, written at the end of the file.
std::unique_ptr<Report> make_textgrid_report();

/// Rich Transcription Time Marked: a SPEAKER line for each utterance, of speaker "speech".
std::unique_ptr<Report> make_rttm_report();

}  // namespace orvalis::cli
