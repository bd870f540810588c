// The tool's label formats, parsed as their programs do.
#include <gtest/gtest.h>

#include <cmath>
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

  /// The utterances, or what is left between the start and the end of the file.
  std::vector<Span> expected(const std::string &options) const {
    std::vector<Span> utterances, silences = {{0, 0}};
    for (const Json &line : epd(kNarrow)) {
      utterances.push_back({line["start"], line["end"]});
      silences.back().end = line["start"];
      silences.push_back({line["end"], kSeconds});
    }
    EXPECT_EQ(utterances.size(), 6u);
    return options.empty() ? utterances : silences;
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

const std::string kBoth[] = {"", "--silences "};

TEST_F(LabelFormats, CsvHoldsEveryFieldAndAnyFileName) {
  const std::string name = folder_ / "two, \"three\".wav";
  std::filesystem::copy(kNarrow, name);
  for (const std::string &option : kBoth) {
    std::istringstream lines(labels(option + "--format csv '" + name + "'"));
    std::string line;
    std::getline(lines, line);
    EXPECT_EQ(line, option.empty() ? "file,number,start,end,duration,began,ended,open"
                                   : "file,silence,start,end,duration");
    std::vector<Span> found;
    for (const Json &same : epd(option + kNarrow)) {
      std::getline(lines, line);
      const auto fields = csv_fields(line);
      ASSERT_EQ(fields.size(), option.empty() ? 8u : 5u) << line;
      EXPECT_EQ(fields[0], name);
      found.push_back({std::stod(fields[2]), std::stod(fields[3])});
      EXPECT_EQ(fields[1], std::to_string(found.size()));
      EXPECT_NEAR(std::stod(fields[4]), found.back().end - found.back().start, 1e-6);
      EXPECT_EQ(same[option.empty() ? "number" : "silence"], found.size());
      EXPECT_EQ(same["start_sample"], std::lround(8000 * found.back().start));
      EXPECT_EQ(same["end_sample"], std::lround(8000 * found.back().end));
    }
    EXPECT_FALSE(std::getline(lines, line)) << line;
    expect_same(found, expected(option));
  }
  EXPECT_EQ(labels("--format csv --frames " + kNarrow).find("file,frame,start,answer\n"), 0u);
}

TEST_F(LabelFormats, LabelsAreTabSeparated) {
  for (const std::string &option : kBoth) {
    std::istringstream lines(labels(option + "--format labels " + kNarrow));
    const std::string text = option.empty() ? "\tutterance " : "\tsilence ";
    std::vector<Span> found;
    std::string label;
    for (Span span; lines >> span.start >> span.end && std::getline(lines, label);) {
      EXPECT_EQ(label, text + std::to_string(found.size() + 1));
      found.push_back(span);
    }
    expect_same(found, expected(option));
  }
}

TEST_F(LabelFormats, RttmNamesTheFileAndGivesDurations) {
  for (const std::string &option : kBoth) {
    std::istringstream lines(labels(option + "--format rttm " + kNarrow));
    std::vector<Span> found;
    std::string type, file, na, subtype, speaker;
    int channel;
    double start, duration;
    while (lines >> type >> file >> channel >> start >> duration >> na >> subtype >> speaker >>
           na >> na) {
      EXPECT_EQ(type + file + std::to_string(channel) + subtype + speaker + na,
                option.empty() ? "SPEAKERall1<NA>speech<NA>" : "NON-SPEECHall1other<NA><NA>");
      found.push_back({start, start + duration});
    }
    expect_same(found, expected(option), 1e-3);
  }
}

TEST_F(LabelFormats, TextGridCoversTheFileWithoutHoles) {
  for (const std::string &option : kBoth) {
    const std::string text = labels(option + "--format textgrid " + kNarrow);
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
      if (values[i + 2] == (option.empty() ? "\"speech\"" : "\"silence\""))
        found.push_back({std::stod(values[i]), end});
    }
    EXPECT_NEAR(end, kSeconds, 1e-6);
    expect_same(found, expected(option));
  }
}

}  // namespace
}  // namespace orvalis::test
