#include "cli/report.h"

#include <fmt/format.h>

#include <algorithm>
#include <cctype>
#include <cmath>
#include <nlohmann/json.hpp>

#include "cli/audio_file.h"

namespace orvalis::cli {
namespace {

/// What all formats share. By default they hold utterances and silences only.
class FileReport : public Report {
public:
  explicit FileReport(Console &console) : console_(console) {}

  void begin_file(const std::string &name, int rate_hz, Reported) override {
    name_ = name;
    rate_hz_ = rate_hz;
  }
  void frame(std::int64_t, int) override {}
  void trace(std::int64_t, double, const Trace &) override {}
  void statistics(const Statistics &) override {}
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

  void begin_file(const std::string &name, int rate_hz, Reported reported) override {
    FileReport::begin_file(name, rate_hz, reported);
    // Statistics are one table, with a row for each file.
    if (reported == Reported::kStatistics) return;
    what_ = reported == Reported::kSilences ? "silence" : "utterance";
    empty_ = true;
    if (headings_) print_line(fmt::format("{}{}", first_ ? "" : "\n", printable(name)));
    first_ = false;
  }

  void utterance(const Utterance &found) override { print_row(found, found.open ? "  open" : ""); }

  void silence(const Silence &found) override { print_row(found, ""); }

  void frame(std::int64_t number, int decision) override {
    column_names("    frame     start    answer");
    print_line(
        fmt::format("{:9} {:9.2f} {:9}", number, static_cast<double>(number) / 100, decision));
  }

  void statistics(const Statistics &values) override {
    column_names("   length    speech    share  utterances   clipped  file");
    print_line(fmt::format("{:9.3f} {:9.3f} {:7.1f}% {:11} {:9}  {}", seconds(values.length),
                           seconds(values.speech), 100 * values.share(), values.utterances,
                           values.clipped, printable(name_)));
  }

  void end_file(std::int64_t) override {
    if (empty_) print_line(std::string("no ") + what_);
  }

private:
  template <class Found>
  void print_row(const Found &found, const char *mark) {
    column_names(fmt::format("{:>9}     start       end  duration", what_));
    print_line(fmt::format("{:9} {:9.3f} {:9.3f} {:9.3f}{}", found.number, seconds(found.start),
                           seconds(found.end), seconds(found.end - found.start), mark));
  }

  void column_names(const std::string &names) {
    if (empty_) print_line(names);
    empty_ = false;
  }

  bool headings_;
  const char *what_ = "";
  bool first_ = true;
  bool empty_ = true;
};

/// For a program: one object per line.
class JsonReport : public FileReport {
public:
  using FileReport::FileReport;

  void utterance(const Utterance &found) override {
    print({{"number", found.number},
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

  void silence(const Silence &found) override {
    print({{"silence", found.number},
           {"start", seconds(found.start)},
           {"end", seconds(found.end)},
           {"duration", seconds(found.end - found.start)},
           {"start_sample", found.start},
           {"end_sample", found.end}});
  }

  void statistics(const Statistics &values) override {
    print({{"length", seconds(values.length)},
           {"speech", seconds(values.speech)},
           {"share", values.share()},
           {"utterances", values.utterances},
           {"clipped", values.clipped}});
  }

  void frame(std::int64_t number, int decision) override {
    print({{"frame", number}, {"start", static_cast<double>(number) / 100}, {"answer", decision}});
  }

  void trace(std::int64_t number, double start_s, const Trace &values) override {
    nlohmann::ordered_json found = {{"frame", number}, {"start", start_s}};
    for (const TraceValue &traced : values)
      std::visit([&](auto value) { found[traced.name] = json_number(value); }, traced.value);
    print(found);
  }

private:
  static nlohmann::ordered_json json_number(std::int64_t value) { return value; }

  /// With the digits of single precision; infinity and NaN become null.
  static nlohmann::ordered_json json_number(float value) {
    return std::isfinite(value) ? nlohmann::ordered_json::parse(fmt::format("{}", value)) : nullptr;
  }

  void print(const nlohmann::ordered_json &found) {
    nlohmann::ordered_json line = {{"file", name_}, {"rate", rate_hz_}};
    line.update(found);
    // File names are any bytes, and those that are not UTF-8 must not stop the report.
    print_line(line.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace));
  }
};

/// For a spreadsheet: RFC 4180 without the carriage returns, with one header for all files.
class CsvReport : public FileReport {
public:
  using FileReport::FileReport;

  void utterance(const Utterance &found) override {
    print("number,start,end,duration,began,ended,open",
          fmt::format("{},{:.6f},{:.6f},{:.6f},{:.6f},{:.6f},{}", found.number,
                      seconds(found.start), seconds(found.end), seconds(found.end - found.start),
                      seconds(found.began), seconds(found.ended), found.open));
  }

  void silence(const Silence &found) override {
    print("silence,start,end,duration",
          fmt::format("{},{:.6f},{:.6f},{:.6f}", found.number, seconds(found.start),
                      seconds(found.end), seconds(found.end - found.start)));
  }

  void statistics(const Statistics &values) override {
    print("length,speech,share,utterances,clipped",
          fmt::format("{:.6f},{:.6f},{:.6f},{},{}", seconds(values.length), seconds(values.speech),
                      values.share(), values.utterances, values.clipped));
  }

  void frame(std::int64_t number, int decision) override {
    print("frame,start,answer",
          fmt::format("{},{:.2f},{}", number, static_cast<double>(number) / 100, decision));
  }

  void trace(std::int64_t number, double start_s, const Trace &values) override {
    std::string names = "frame,start", fields = fmt::format("{},{:.2f}", number, start_s);
    for (const TraceValue &traced : values) {
      names += std::string(",") + traced.name;
      std::visit([&](auto value) { fields += fmt::format(",{}", value); }, traced.value);
    }
    print(names, fields);
  }

private:
  static std::string quoted(const std::string &field) {
    if (field.find_first_of(",\"\r\n") == std::string::npos) return field;
    std::string text = "\"";
    for (const char c : field) text += c == '"' ? "\"\"" : std::string(1, c);
    return text + '"';
  }

  void print(const std::string &names, const std::string &fields) {
    if (!has_header_) print_line("file," + names);
    has_header_ = true;
    print_line(quoted(name_) + "," + fields);
  }

  bool has_header_ = false;
};

/// A label track as Audacity imports it: start, end and label, separated by tabs.
class LabelsReport : public FileReport {
public:
  using FileReport::FileReport;

  void utterance(const Utterance &found) override { print_label("utterance", found); }
  void silence(const Silence &found) override { print_label("silence", found); }

private:
  template <class Found>
  void print_label(const char *what, const Found &found) {
    print_line(fmt::format("{:.6f}\t{:.6f}\t{} {}", seconds(found.start), seconds(found.end), what,
                           found.number));
  }
};

/// A Praat TextGrid in the long text format: one interval tier, with the text "speech" where there
/// is an utterance, or "silence" where there is a silence.
class TextGridReport : public FileReport {
public:
  using FileReport::FileReport;

  void utterance(const Utterance &found) override {
    found_.push_back({found.start, found.end, "speech"});
  }
  void silence(const Silence &found) override {
    found_.push_back({found.start, found.end, "silence"});
  }

  void end_file(std::int64_t samples) override {
    std::string intervals;
    std::int64_t done = 0;
    int count = 0;
    // The tier must cover the file without gaps; the intervals in between have no text.
    const auto add = [&](std::int64_t end, const char *text) {
      if (end <= done) return;
      intervals += fmt::format(
          "        intervals [{}]:\n            xmin = {:.6f}\n            xmax = {:.6f}\n"
          "            text = \"{}\"\n",
          ++count, seconds(done), seconds(end), text);
      done = end;
    };
    for (const Interval &found : found_) {
      add(found.start, "");
      add(found.end, found.text);
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
  struct Interval {
    std::int64_t start, end;
    const char *text;
  };

  std::vector<Interval> found_;
};

/// Rich Transcription Time Marked: an utterance has a speaker called "speech"; a silence is no
/// speech, of a kind that has no name.
class RttmReport : public FileReport {
public:
  using FileReport::FileReport;

  void utterance(const Utterance &found) override { print_object("SPEAKER", found, "<NA> speech"); }
  void silence(const Silence &found) override { print_object("NON-SPEECH", found, "other <NA>"); }

private:
  template <class Found>
  void print_object(const char *type, const Found &found, const char *subtype_and_name) {
    print_line(fmt::format("{} {} 1 {:.3f} {:.3f} <NA> {} <NA> <NA>", type, file_id(),
                           seconds(found.start), seconds(found.end - found.start),
                           subtype_and_name));
  }

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
