#include "cli/report.h"

#include <fmt/format.h>

#include <cerrno>
#include <cmath>
#include <cstdio>
#include <nlohmann/json.hpp>
#include <system_error>
#include <variant>

#include "cli/progress.h"

namespace orvalis::cli {
namespace {

class TableReport : public Report {
public:
  explicit TableReport(bool headings) : headings_(headings) {}

  void begin_file(const std::string &name, int rate_hz) override {
    rate_hz_ = rate_hz;
    empty_ = true;
    if (headings_) print_line(first_ ? name : "\n" + name);
    first_ = false;
  }

  void utterance(const Utterance &found) override {
    column_names("utterance     start       end  duration");
    print_line(fmt::format("{:9} {:9.3f} {:9.3f} {:9.3f}{}", found.number, seconds(found.start),
                           seconds(found.end), seconds(found.end - found.start),
                           found.open ? "  open" : ""));
  }

  void frame(std::int64_t number, int answer) override {
    column_names("    frame     start    answer");
    print_line(fmt::format("{:9} {:9.2f} {:9}", number, static_cast<double>(number) / 100, answer));
  }

  void trace(std::int64_t, double, const Trace &) override {}

  void end_file(std::int64_t) override {
    if (empty_) print_line("no utterance");
  }

private:
  double seconds(std::int64_t samples) const { return static_cast<double>(samples) / rate_hz_; }

  void column_names(const char *names) {
    if (empty_) print_line(names);
    empty_ = false;
  }

  bool headings_;
  bool first_ = true;
  bool empty_ = true;
  int rate_hz_ = 0;
};

class JsonReport : public Report {
public:
  void begin_file(const std::string &name, int rate_hz) override {
    name_ = name;
    rate_hz_ = rate_hz;
  }

  void utterance(const Utterance &found) override {
    print({{"file", name_},
           {"rate", rate_hz_},
           {"number", found.number},
           {"start", seconds(found.start)},
           {"end", seconds(found.end)},
           {"duration", seconds(found.end - found.start)},
           {"began", seconds(found.began)},
           {"ended", seconds(found.ended)},
           {"start_sample", found.start},
           {"end_sample", found.end},
           {"began_sample", found.began},
           {"ended_sample", found.ended},
           {"open", found.open != 0}});
  }

  void frame(std::int64_t number, int answer) override {
    print({{"file", name_},
           {"rate", rate_hz_},
           {"frame", number},
           {"start", static_cast<double>(number) / 100},
           {"answer", answer}});
  }

  void trace(std::int64_t number, double start_s, const Trace &values) override {
    nlohmann::ordered_json line = {
        {"file", name_}, {"rate", rate_hz_}, {"frame", number}, {"start", start_s}};
    for (const TraceValue &traced : values)
      std::visit([&](auto value) { line[traced.name] = json_number(value); }, traced.value);
    print(line);
  }

  void end_file(std::int64_t) override {}

private:
  static nlohmann::ordered_json json_number(std::int64_t value) { return value; }

  /// In as many digits as single precision has; what is no number is null.
  static nlohmann::ordered_json json_number(float value) {
    return std::isfinite(value) ? nlohmann::ordered_json::parse(fmt::format("{}", value)) : nullptr;
  }

  double seconds(std::int64_t samples) const { return static_cast<double>(samples) / rate_hz_; }

  static void print(const nlohmann::ordered_json &line) {
    // File names are bytes; what is not UTF-8 in them must not stop the report.
    print_line(line.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace));
  }

  std::string name_;
  int rate_hz_ = 0;
};

}  // namespace

std::unique_ptr<Report> make_table_report(bool headings) {
  return std::make_unique<TableReport>(headings);
}

std::unique_ptr<Report> make_json_report() { return std::make_unique<JsonReport>(); }

void print_line(const std::string &line) {
  wipe_progress();
  if (std::fputs((line + "\n").c_str(), stdout) == EOF || std::fflush(stdout) == EOF)
    throw std::system_error(errno, std::generic_category(), "standard output");
}

void print_error(const std::string &message) {
  wipe_progress();
  std::fputs(("orvalis: " + message + "\n").c_str(), stderr);
}

void print_note(const std::string &name, const std::string &text) {
  print_error(fmt::format("{}: {}", name == "-" ? "standard input" : name, text));
}

void print_input_error(const std::string &name, const std::exception &error) {
  print_note(name, error.what());
}

}  // namespace orvalis::cli
