// What reports on an input begin and end with.
#pragma once

#include <string>

#include "cli/audio_source.h"
#include "cli/report.h"

namespace orvalis::cli {

/// `hear` reads the source to its end and reports what it finds.
template <class Hear>
void report_input(const std::string &name, const AudioSource &source, Report &report, Hear hear) {
  report.begin_file(name, source.rate_hz());
  hear();
  report.end_file(source.samples_read());
  // Last, so that a damaged file still gives what could be decided.
  source.check_complete();
}

}  // namespace orvalis::cli
