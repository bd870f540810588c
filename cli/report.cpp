#include "cli/report.h"

#include <fmt/format.h>

#include <algorithm>
#include <cctype>
#include <cmath>
#include <nlohmann/json.hpp>

#include "cli/audio_file.h"

namespace orvalis::cli {
namespace {

/// What all formats share. By default they hold utterances only.
class FileReport : public Report {
public:
  explicit FileReport(Console &console) : console_(console) {}

  void begin_file(const std::string &name, int rate_hz) override {
    name_ = name;
    rate_hz_ = rate_hz;
  }
  void frame(std::int64_t, int) override {}
  void trace(std::int64_t, double, const Trace &) override {}
  void end_file(std::int64_t) override {}

protected:
  double seconds(std::int64_t samples) const { return static_cast<double>(samples) / rate_hz_; }
  void print_line(const std::string &line) { console_.print_line(line); }

  Console &console_;
  std::string name_;
  int rate_hz_ = 0;
};

/// For a reader.
class TableReport : public FileReport {
public:
  TableReport(Console &console, bool headings) : FileReport(console), headings_(headings) {}

  void begin_file(const std::string &name, int rate_hz) override {
    FileReport::begin_file(name, rate_hz);
    empty_ = true;
    if (headings_) print_line(fmt::format("{}{}", first_ ? "" : "\n", printable(name)));
    first_ = false;
  }

  void utterance(const Utterance &found) override {
    column_names("utterance     start       end  duration");
    print_line(fmt::format("{:9} {:9.3f} {:9.3f} {:9.3f}{}", found.number, seconds(found.start),
                           seconds(found.end), seconds(found.end - found.start),
                           found.open ? "  open" : ""));
  }

  void frame(std::int64_t number, int decision) override {
    column_names("    frame     start    answer");
    print_line(
        fmt::format("{:9} {:9.2f} {:9}", number, static_cast<double>(number) / 100, decision));
  }

  void end_file(std::int64_t) override {
    if (empty_) print_line("no utterance");
  }

private:
  void column_names(const char *names) {
    if (empty_) print_line(names);
    empty_ = false;
  }

  bool headings_;
  bool first_ = true;
  bool empty_ = true;
};

/// For a program: one object per line.
class JsonReport : public FileReport {
public:
  using FileReport::FileReport;

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

  void frame(std::int64_t number, int decision) override {
    print({{"file", name_},
           {"rate", rate_hz_},
           {"frame", number},
           {"start", static_cast<double>(number) / 100},
           {"answer", decision}});
  }

  void trace(std::int64_t number, double start_s, const Trace &values) override {
    nlohmann::ordered_json line = {
        {"file", name_}, {"rate", rate_hz_}, {"frame", number}, {"start", start_s}};
    for (const TraceValue &traced : values)
      std::visit([&](auto value) { line[traced.name] = json_number(value); }, traced.value);
    print(line);
  }

private:
  static nlohmann::ordered_json json_number(std::int64_t value) { return value; }

  /// With the digits of single precision; infinity and NaN become null.
  static nlohmann::ordered_json json_number(float value) {
    return std::isfinite(value) ? nlohmann::ordered_json::parse(fmt::format("{}", value)) : nullptr;
  }

  void print(const nlohmann::ordered_json &line) {
    // File names are any bytes, and those that are not UTF-8 must not stop the report.
    print_line(line.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace));
  }
};

/// For a spreadsheet: RFC 4180 without the carriage returns, with one header for all files.
class CsvReport : public FileReport {
public:
  using FileReport::FileReport;

  void utterance(const Utterance &found) override {
    header("file,number,start,end,duration,began,ended,open");
    print_line(fmt::format("{},{},{:.6f},{:.6f},{:.6f},{:.6f},{:.6f},{}", quoted(name_),
                           found.number, seconds(found.start), seconds(found.end),
                           seconds(found.end - found.start), seconds(found.began),
                           seconds(found.ended), found.open));
  }

  void frame(std::int64_t number, int decision) override {
    header("file,frame,start,answer");
    print_line(fmt::format("{},{},{:.2f},{}", quoted(name_), number,
                           static_cast<double>(number) / 100, decision));
  }

  void trace(std::int64_t number, double start_s, const Trace &values) override {
    std::string names = "file,frame,start";
    std::string line = fmt::format("{},{},{:.2f}", quoted(name_), number, start_s);
    for (const TraceValue &traced : values) {
      names += std::string(",") + traced.name;
      std::visit([&](auto value) { line += fmt::format(",{}", value); }, traced.value);
    }
    header(names);
    print_line(line);
  }

private:
  static std::string quoted(const std::string &field) {
    if (field.find_first_of(",\"\r\n") == std::string::npos) return field;
    std::string text = "\"";
    for (const char c : field) text += c == '"' ? "\"\"" : std::string(1, c);
    return text + '"';
  }

  void header(const std::string &names) {
    if (!has_header_) print_line(names);
    has_header_ = true;
  }

  bool has_header_ = false;
};

/// A label track as Audacity imports it: start, end and label, separated by tabs.
class LabelsReport : public FileReport {
public:
  using FileReport::FileReport;

  void utterance(const Utterance &found) override {
    print_line(fmt::format("{:.6f}\t{:.6f}\tutterance {}", seconds(found.start), seconds(found.end),
                           found.number));
  }
};

/// A Praat TextGrid in the long text format: one interval tier, with the text "speech" where there
/// is an utterance.
class TextGridReport : public FileReport {
public:
  using FileReport::FileReport;

  void utterance(const Utterance &found) override { found_.push_back(found); }

  void end_file(std::int64_t samples) override {
    std::string intervals;
    std::int64_t done = 0;
    int count = 0;
    // The tier must cover the file without gaps; intervals between utterances have no text.
    const auto add = [&](std::int64_t end, const char *text) {
      if (end <= done) return;
      intervals += fmt::format(
          "        intervals [{}]:\n            xmin = {:.6f}\n            xmax = {:.6f}\n"
          "            text = \"{}\"\n",
          ++count, seconds(done), seconds(end), text);
      done = end;
    };
    for (const Utterance &found : found_) {
      add(found.start, "");
      add(found.end, "speech");
    }
    add(samples, "");
    print_line(fmt::format(
        "File type = \"ooTextFile\"\nObject class = \"TextGrid\"\n\nxmin = 0\nxmax = {0:.6f}\n"
        "tiers? <exists>\nsize = 1\nitem []:\n    item [1]:\n        class = \"IntervalTier\"\n"
        "        name = \"orvalis\"\n        xmin = 0\n        xmax = {0:.6f}\n"
        "        intervals: size = {1}\n{2}",
        seconds(samples), count, intervals));
    found_.clear();
  }

private:
  std::vector<Utterance> found_;
};

/// Rich Transcription Time Marked: a line for each utterance, of a speaker called "speech".
class RttmReport : public FileReport {
public:
  using FileReport::FileReport;

  void utterance(const Utterance &found) override {
    print_line(fmt::format("SPEAKER {} 1 {:.3f} {:.3f} <NA> <NA> speech <NA> <NA>", file_id(),
                           seconds(found.start), seconds(found.end - found.start)));
  }

private:
  /// The file's name without folder, ending and white space, as tools match it.
  std::string file_id() const {
    std::string id = file_name_of(name_).stem();
    std::ranges::replace_if(
        id, [](unsigned char c) { return std::isspace(c) != 0; }, '_');
    return id;
  }
};

template <class Format>
std::unique_ptr<Report> make(Console &console, bool) {
  return std::make_unique<Format>(console);
}

std::unique_ptr<Report> make_table(Console &console, bool headings) {
  return std::make_unique<TableReport>(console, headings);
}

}  // namespace

const std::vector<ReportFormat> &report_formats() {
  static const std::vector<ReportFormat> kFormats = {
      {"table", true, true, false, make_table},
      {"json", true, true, true, make<JsonReport>},
      {"csv", true, true, true, make<CsvReport>},
      {"labels", false, false, false, make<LabelsReport>},
      {"textgrid", false, false, false, make<TextGridReport>},
      {"rttm", true, false, false, make<RttmReport>},
  };
  return kFormats;
}

}  // namespace orvalis::cli
