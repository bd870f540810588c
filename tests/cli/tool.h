// The built tool, run as its users run it: command line in, text and exit status out.
#pragma once

#include <gtest/gtest.h>

#include <fstream>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "tests/support/child_process.h"
#include "tests/support/temporary_folder.h"

namespace orvalis::test {

using Json = nlohmann::json;

inline const std::string kWide = ORVALIS_SPEECH_16K "/cards/005.wav";
inline const std::string kWideOpen = ORVALIS_SPEECH_16K "/cards/001.wav";  // ends in speech
inline const std::string kNarrow = ORVALIS_SPEECH_8K "/wav/all.wav";       // six utterances
constexpr std::size_t kWavHeader = 44;

inline std::vector<Json> json_lines(const std::string &text) {
  std::vector<Json> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) lines.push_back(Json::parse(line));
  return lines;
}

class Tool : public testing::Test {
protected:
  struct Result {
    int status;
    std::string out, err;
  };

  static std::string command(const std::string &arguments) {
    return ORVALIS_TOOL_PATH " " + arguments;
  }

  Result run(const std::string &arguments, const std::string &input = {}) const {
    ChildProcess child(command(arguments), folder_.path());
    child.write(input);
    const int status = child.finish();
    return {status, child.output(), child.errors()};
  }

  /// The utterances, of a run that must go well and quietly.
  std::vector<Json> epd(const std::string &arguments, const std::string &input = {}) const {
    const Result result = run("epd -q --format json " + arguments, input);
    EXPECT_EQ(result.status, 0) << arguments;
    EXPECT_EQ(result.err, "") << arguments;
    return json_lines(result.out);
  }

  /// The same without the file's name.
  std::vector<Json> unnamed(const std::string &arguments, const std::string &input = {}) const {
    std::vector<Json> lines = epd(arguments, input);
    for (Json &line : lines) line.erase("file");
    return lines;
  }

  std::string write(const std::string &name, const std::string &bytes) const {
    std::ofstream(folder_ / name, std::ios::binary) << bytes;
    return folder_ / name;
  }

  TemporaryFolder folder_;
};

}  // namespace orvalis::test
