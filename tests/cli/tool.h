// The built tool, run as its users run it: command line in, text and exit status out.
#pragma once

#include <enhancement_stream.h>
#include <gtest/gtest.h>
#include <orvalis.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "tests/support/audio_file.h"
#include "tests/support/child_process.h"
#include "tests/support/noise.h"
#include "tests/support/recordings.h"
#include "tests/support/temporary_folder.h"

namespace orvalis::test {

namespace fs = std::filesystem;
using Json = nlohmann::json;
using Names = std::vector<std::string>;

inline const std::string kWide = ORVALIS_SPEECH_16K "/cards/005.wav";
inline const std::string kWideOpen = ORVALIS_SPEECH_16K "/cards/001.wav";  // ends in speech
inline const std::string kNarrow = ORVALIS_SPEECH_8K "/wav/all.wav";       // six utterances
constexpr std::size_t kWavHeader = 44;
constexpr int kWav16 = SF_FORMAT_WAV | SF_FORMAT_PCM_16;

inline std::vector<Json> json_lines(const std::string &text) {
  std::vector<Json> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) lines.push_back(Json::parse(line));
  return lines;
}

inline std::string bytes_of(const Pcm &samples) {
  return {reinterpret_cast<const char *>(samples.data()), 2 * samples.size()};
}

inline Pcm samples_of(const std::string &bytes) {
  Pcm samples(bytes.size() / 2);
  std::copy_n(bytes.data(), 2 * samples.size(), reinterpret_cast<char *>(samples.data()));
  return samples;
}

inline Pcm samples_in(const std::string &file) {
  Pcm samples;
  for (const double value : read_audio(file).samples)
    samples.push_back(static_cast<std::int16_t>(value * 32768));
  return samples;
}

/// Two channels in turns.
inline Pcm interleaved(const Pcm &left, const Pcm &right) {
  Pcm pairs;
  for (std::size_t i = 0; i < left.size(); ++i) pairs.insert(pairs.end(), {left[i], right[i]});
  return pairs;
}

/// The output of the library's stream.
inline Pcm enhanced(const EnhancementSettings &settings, const Pcm &input) {
  EnhancementStream *stream = OpenEnhancementStream(&settings);
  Pcm output(input.size() + ENHANCEMENT_HELD_BACK);
  const auto room = static_cast<std::int32_t>(output.size());
  const auto count = static_cast<std::int32_t>(input.size());
  std::int32_t ready = PushEnhancementAudio(stream, input.data(), count, output.data(), room);
  ready += FlushEnhancementStream(stream, output.data() + ready, room - ready);
  CloseEnhancementStream(stream);
  output.resize(static_cast<std::size_t>(ready));
  return output;
}

constexpr EnhancementSettings kDenoise = ENHANCEMENT_SETTINGS_DEFAULT, kLevel = {1, 0, 1, 1};

class Tool : public testing::Test {
protected:
  struct Result {
    int status;
    std::string out, err;
  };

  Tool() { SetLogSink(LogNothing, nullptr); }

  static std::string command(const std::string &arguments) {
    return ORVALIS_TOOL_PATH " " + arguments;
  }

  Result shell(const std::string &line, const std::string &input = {}) const {
    ChildProcess child(line, folder_.path());
    child.write(input);
    const int status = child.finish();
    return {status, child.output(), child.errors()};
  }

  Result run(const std::string &arguments, const std::string &input = {}) const {
    return shell(command(arguments), input);
  }

  /// What is found, by a run that must go well and quietly.
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

  /// Raw samples through a command.
  Pcm through(const std::string &arguments, const Pcm &input) const {
    const Result result = run(arguments + " --raw --format raw - -", bytes_of(input));
    EXPECT_EQ(result.status, 0) << arguments << ": " << result.err;
    return samples_of(result.out);
  }

  std::string write(const std::string &name, const std::string &bytes) const {
    std::ofstream(folder_ / name, std::ios::binary) << bytes;
    return folder_ / name;
  }

  std::string wav(const std::string &name, const Pcm &samples, int rate_hz = 16000,
                  int channels = 1) const {
    write_audio(folder_ / name, samples, rate_hz, channels, kWav16);
    return folder_ / name;
  }

  static Names names_in(const fs::path &folder) {
    Names names;
    for (const auto &entry : fs::directory_iterator(folder))
      names.push_back(entry.path().filename());
    std::ranges::sort(names);
    return names;
  }

  TemporaryFolder folder_;
};

}  // namespace orvalis::test
