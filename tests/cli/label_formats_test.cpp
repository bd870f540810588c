// The tool's label formats, parsed as their programs do.
#include <gtest/gtest.h>

#include <filesystem>
#include <sstream>
#include <string>
#include <vector>

#include "tests/cli/tool.h"

namespace orvalis::test {
namespace {

constexpr double kSeconds = 456912 / 8000.0;

struct Span {
  double start, end;
};

class LabelFormats : public Tool {
protected:
  std::string labels(const std::string &arguments) const {
    const Result result = run("epd " + arguments);
    EXPECT_EQ(result.status, 0) << arguments << result.err;
    return result.out;
  }

  std::vector<Span> utterances() const {
    std::vector<Span> found;
    for (const Json &line : epd(kNarrow)) found.push_back({line["start"], line["end"]});
    EXPECT_EQ(found.size(), 6u);
    return found;
  }

  static void expect_same(const std::vector<Span> &found, const std::vector<Span> &expected,
                          double tolerance = 1e-6) {
    ASSERT_EQ(found.size(), expected.size());
    for (std::size_t i = 0; i < found.size(); ++i) {
      EXPECT_NEAR(found[i].start, expected[i].start, tolerance);
      EXPECT_NEAR(found[i].end, expected[i].end, tolerance);
    }
  }
};

/// Fields of a CSV line; quoted ones may hold commas and doubled quotes.
std::vector<std::string> csv_fields(const std::string &line) {
  std::vector<std::string> fields(1);
  bool quoted = false;
  for (std::size_t i = 0; i < line.size(); ++i) {
    if (line[i] == '"' && quoted && line[i + 1] == '"') {
      fields.back() += line[i++];
    } else if (line[i] == '"') {
      quoted = !quoted;
    } else if (line[i] == ',' && !quoted) {
      fields.emplace_back();
    } else {
      fields.back() += line[i];
    }
  }
  return fields;
}

TEST_F(LabelFormats, CsvHoldsEveryFieldAndAnyFileName) {
  const std::string name = folder_ / "two, \"three\".wav";
  std::filesystem::copy(kNarrow, name);
  std::istringstream lines(labels("--format csv '" + name + "'"));
  std::string line;
  std::getline(lines, line);
  EXPECT_EQ(line, "file,number,start,end,duration,began,ended,open");
  std::vector<Span> found;
  while (std::getline(lines, line)) {
    const auto fields = csv_fields(line);
    ASSERT_EQ(fields.size(), 8u) << line;
    EXPECT_EQ(fields[0], name);
    found.push_back({std::stod(fields[2]), std::stod(fields[3])});
    EXPECT_NEAR(std::stod(fields[4]), found.back().end - found.back().start, 1e-6);
  }
  expect_same(found, utterances());
  EXPECT_EQ(labels("--format csv --frames " + kNarrow).find("file,frame,start,answer\n"), 0u);
}

TEST_F(LabelFormats, LabelsAreTabSeparated) {
  std::istringstream lines(labels("--format labels " + kNarrow));
  std::vector<Span> found;
  std::string label;
  for (Span span; lines >> span.start >> span.end && std::getline(lines, label);) {
    EXPECT_EQ(label, "\tutterance " + std::to_string(found.size() + 1));
    found.push_back(span);
  }
  expect_same(found, utterances());
}

TEST_F(LabelFormats, RttmNamesTheFileAndGivesDurations) {
  std::istringstream lines(labels("--format rttm " + kNarrow));
  std::vector<Span> found;
  std::string type, file, na, speaker;
  int channel;
  double start, duration;
  while (lines >> type >> file >> channel >> start >> duration >> na >> na >> speaker >> na >> na) {
    EXPECT_EQ(type + file + std::to_string(channel) + speaker + na, "SPEAKERall1speech<NA>");
    found.push_back({start, start + duration});
  }
  expect_same(found, utterances(), 1e-3);
}

TEST_F(LabelFormats, TextGridCoversTheFileWithoutHoles) {
  const std::string text = labels("--format textgrid " + kNarrow);
  EXPECT_EQ(text.find("File type = \"ooTextFile\"\nObject class = \"TextGrid\"\n"), 0u);
  // Praat reads values by their order and skips what stands before them.
  std::vector<std::string> values;
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    const auto at = line.find("= ");
    if (at != std::string::npos) values.push_back(line.substr(at + 2));
  }
  const std::size_t kHead = 10;
  ASSERT_GT(values.size(), kHead);
  EXPECT_NEAR(std::stod(values[3]), kSeconds, 1e-6);
  EXPECT_EQ(values[5], "\"IntervalTier\"");
  const std::size_t count = std::stoul(values[9]);
  ASSERT_EQ(values.size(), kHead + 3 * count);
  std::vector<Span> found;
  double end = 0;
  for (std::size_t i = kHead; i < values.size(); i += 3) {
    EXPECT_EQ(std::stod(values[i]), end);
    end = std::stod(values[i + 1]);
    if (values[i + 2] == "\"speech\"") found.push_back({std::stod(values[i]), end});
  }
  EXPECT_NEAR(end, kSeconds, 1e-6);
  expect_same(found, utterances());
}

TEST_F(LabelFormats, OneFileFormatsRefuseSeveral) {
  for (const std::string format : {"labels", "textgrid"})
    EXPECT_EQ(run("epd --format " + format + " " + kNarrow + " " + kNarrow).status, 2);
  for (const std::string format : {"labels", "textgrid", "rttm"})
    EXPECT_EQ(run("epd --frames --format " + format + " " + kNarrow).status, 2);
}

}  // namespace
}  // namespace orvalis::test
