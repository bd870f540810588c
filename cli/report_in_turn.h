// A job's report, given when it is the job's turn.
#pragma once

#include "cli/report.h"
#include "cli/turns.h"

namespace orvalis::cli {

class ReportInTurn : public Report {
public:
  ReportInTurn(Report &report, Turn &turn) : report_(report), turn_(turn) {}

  void begin_file(const std::string &name, int rate_hz) override {
    turn_.act([name, rate_hz, &report = report_] { report.begin_file(name, rate_hz); });
  }
  void utterance(const Utterance &found) override {
    turn_.act([found, &report = report_] { report.utterance(found); });
  }
  void frame(std::int64_t number, int answer) override {
    turn_.act([number, answer, &report = report_] { report.frame(number, answer); });
  }
  void trace(std::int64_t number, double start_s, const Trace &values) override {
    turn_.act([=, &report = report_] { report.trace(number, start_s, values); });
  }
  void end_file(std::int64_t samples) override {
    turn_.act([samples, &report = report_] { report.end_file(samples); });
  }

private:
  Report &report_;
  Turn &turn_;
};

}  // namespace orvalis::cli
