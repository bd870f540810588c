#include "cli/label_reports.h"

#include <fmt/format.h>

#include <algorithm>
#include <cctype>
#include <filesystem>
#include <variant>
#include <vector>

namespace orvalis::cli {
namespace {

/// What these reports share: where a file begins, and samples as seconds.
class LabelReport : public Report {
public:
  void begin_file(const std::string &name, int rate_hz) override {
    name_ = name;
    rate_hz_ = rate_hz;
  }
  void frame(std::int64_t, int) override {}
  void trace(std::int64_t, double, const Trace &) override {}
  void end_file(std::int64_t) override {}

protected:
  double seconds(std::int64_t samples) const { return static_cast<double>(samples) / rate_hz_; }

  std::string name_;
  int rate_hz_ = 0;
};

class CsvReport : public LabelReport {
public:
  void utterance(const Utterance &found) override {
    header("file,number,start,end,duration,began,ended,open");
    print_line(fmt::format("{},{},{:.6f},{:.6f},{:.6f},{:.6f},{:.6f},{}", quoted(name_),
                           found.number, seconds(found.start), seconds(found.end),
                           seconds(found.end - found.start), seconds(found.began),
                           seconds(found.ended), found.open));
  }

  void frame(std::int64_t number, int answer) override {
    header("file,frame,start,answer");
    print_line(fmt::format("{},{},{:.2f},{}", quoted(name_), number,
                           static_cast<double>(number) / 100, answer));
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

class LabelsReport : public LabelReport {
public:
  void utterance(const Utterance &found) override {
    print_line(fmt::format("{:.6f}\t{:.6f}\tutterance {}", seconds(found.start), seconds(found.end),
                           found.number));
  }
};

class TextGridReport : public LabelReport {
public:
  void utterance(const Utterance &found) override { found_.push_back(found); }

  void end_file(std::int64_t samples) override {
    std::string intervals;
    std::int64_t done = 0;
    int count = 0;
    // The tier must cover the file without a hole: what is between utterances has no text.
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

class RttmReport : public LabelReport {
public:
  void utterance(const Utterance &found) override {
    print_line(fmt::format("SPEAKER {} 1 {:.3f} {:.3f} <NA> <NA> speech <NA> <NA>", file_id(),
                           seconds(found.start), seconds(found.end - found.start)));
  }

private:
  /// The file's name without folder and ending, as tools match it, and without white space.
  std::string file_id() const {
    std::string id = name_ == "-" ? "stdin" : std::filesystem::path(name_).stem().string();
    std::ranges::replace_if(
        id, [](unsigned char c) { return std::isspace(c) != 0; }, '_');
    return id;
  }
};

}  // namespace

std::unique_ptr<Report> make_csv_report() { return std::make_unique<CsvReport>(); }
std::unique_ptr<Report> make_labels_report() { return std::make_unique<LabelsReport>(); }
std::unique_ptr<Report> make_textgrid_report() { return std::make_unique<TextGridReport>(); }
std::unique_ptr<Report> make_rttm_report() { return std::make_unique<RttmReport>(); }

}  // namespace orvalis::cli
