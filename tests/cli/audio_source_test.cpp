// Reading audio: its samples, its length, and reads that fail.
#include "cli/audio_source.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <limits>
#include <map>
#include <numbers>
#include <string>
#include <vector>

#include "cli/commands.h"
#include "tests/support/audio_file.h"
#include "tests/support/child_process.h"
#include "tests/support/recordings.h"
#include "tests/support/temporary_folder.h"

enum class Fault { kNone, kError, kInterrupted, kShort };

namespace {

struct {
  Fault fault = Fault::kNone;
  int at = 0, calls = 0;
} reads;

}  // namespace

// One read(2) of the tool fails.
extern "C" ssize_t __real_read(int descriptor, void *to, std::size_t count);
extern "C" ssize_t __wrap_read(int descriptor, void *to, std::size_t count) {
  if (++reads.calls == reads.at) {
    if (reads.fault == Fault::kShort) count = (count + 1) / 2;
    if (reads.fault <= Fault::kInterrupted && reads.fault != Fault::kNone) {
      errno = reads.fault == Fault::kError ? EIO : EINTR;
      return -1;
    }
  }
  return __real_read(descriptor, to, count);
}

namespace orvalis::cli {
namespace {

using test::TemporaryFolder;
using test::write_audio;

constexpr int kWav16 = SF_FORMAT_WAV | SF_FORMAT_PCM_16;
constexpr int kWavFloat = SF_FORMAT_WAV | SF_FORMAT_FLOAT;

std::vector<short> read_all(const std::string &path, const AudioSettings &settings = {}) {
  AudioSource source(path, settings);
  std::vector<short> samples;
  for (auto chunk = source.read(); !chunk.empty(); chunk = source.read())
    samples.insert(samples.end(), chunk.begin(), chunk.end());
  EXPECT_EQ(source.check_complete().empty(), !settings.partial);
  return samples;
}

/// A pipe that holds up to 64 KB, under the name of a file.
class Pipe {
public:
  explicit Pipe(const std::string &bytes) {
    EXPECT_EQ(pipe(ends_), 0);
    EXPECT_EQ(write(ends_[1], bytes.data(), bytes.size()), std::ssize(bytes));
    close(ends_[1]);
  }
  ~Pipe() { close(ends_[0]); }
  Pipe(const Pipe &) = delete;
  Pipe &operator=(const Pipe &) = delete;

  std::string path() const { return "/dev/fd/" + std::to_string(ends_[0]); }

private:
  int ends_[2];
};

std::string little_endian(std::uint32_t value) {
  return {static_cast<char>(value), static_cast<char>(value >> 8), static_cast<char>(value >> 16),
          static_cast<char>(value >> 24)};
}

std::string chunk(const std::string &name, const std::string &body) {
  return name + little_endian(static_cast<std::uint32_t>(body.size())) + body +
         std::string(body.size() % 2, '\0');
}

/// As a file, and as a pipe if that can carry it.
void expect_length(const std::string &bytes, std::size_t samples, bool cut_short = false,
                   bool streams = true) {
  const TemporaryFolder folder;
  std::ofstream(folder / "take", std::ios::binary) << bytes;
  for (int way = 0; way < (streams ? 2 : 1); ++way) {
    SCOPED_TRACE(way == 0 ? "file" : "pipe");
    const auto read = [&](bool partial) {
      const Pipe pipe(bytes);
      return read_all(way == 0 ? folder / "take" : pipe.path(), {.partial = partial}).size();
    };
    EXPECT_EQ(read(cut_short), samples);
    if (cut_short) {
      EXPECT_THROW(read(false), AudioError);
    }
  }
}

TEST(AudioSource, HeadersPromiseALength) {
  const TemporaryFolder folder;
  const std::pair<int, bool> kFormats[] = {{SF_FORMAT_WAV, true},
                                           {SF_FORMAT_WAV | SF_ENDIAN_BIG, true},
                                           {SF_FORMAT_AIFF, true},
                                           {SF_FORMAT_AU, true},
                                           {SF_FORMAT_AU | SF_ENDIAN_LITTLE, true},
                                           {SF_FORMAT_CAF, false},
                                           {SF_FORMAT_RF64, false},
                                           {SF_FORMAT_W64, false}};
  for (const auto &[format, streams] : kFormats) {
    SCOPED_TRACE(testing::Message() << std::hex << format);
    for (const int samples : {5000, 0}) {
      write_audio(folder / "take", std::vector<short>(static_cast<std::size_t>(samples), 77), 16000,
                  1, format | SF_FORMAT_PCM_16);
      const std::string bytes = test::read_file(folder / "take");
      expect_length(bytes, static_cast<std::size_t>(samples), false, streams);
      if (samples > 0) expect_length(bytes.substr(0, bytes.size() - 400), 4800, true, streams);
    }
  }

  // Whatever else a file holds.
  const std::string audio(1000, '\1'),
      head = "WAVE" + chunk("fmt ", little_endian(0x10001) + little_endian(16000) +
                                        little_endian(32000) + little_endian(0x100002));
  const auto wav = [](std::uint32_t size, const std::string &body) {
    return "RIFF" + little_endian(size) + body;
  };
  std::string junk;
  for (int i = 0; i < 400; ++i) junk += chunk("junk", std::string(21, 'x'));
  expect_length(wav(90, head + junk + chunk("data", audio)), 500);
  expect_length(wav(90, head + junk + "data" + little_endian(2000) + audio), 500, true);
  expect_length(wav(90, head + "data" + little_endian(3000000000) + audio), 500, true);
  const std::string comment = chunk("LIST", "INFO" + chunk("ICMT", " data : 9 (should be 4)\n"));
  expect_length(wav(90, head + comment + chunk("data", audio)), 500);
  expect_length(wav(90, head + "data" + little_endian(999) + audio.substr(1)), 499);

  // Lengths of programs that do not know them; a 0 is true if something follows that counts.
  for (const std::uint32_t open : {0U, 0x7fffffffU, 0x7ffff000U, 0x80000000U, 0xffffffffU})
    expect_length(wav(open, head + "data" + little_endian(open) + audio), 500);
  const std::string none = head + chunk("data", "") + comment;
  expect_length(wav(static_cast<std::uint32_t>(none.size()), none), 0);
  EXPECT_THROW(read_all(Pipe("").path()), AudioError);
  EXPECT_THROW(read_all("/dev/null", {.raw = true}), AudioError);
}

TEST(AudioSource, EveryReadMayFail) {
  const TemporaryFolder folder;
  // One utterance, and the beginning of another.
  auto speech = test::load_recording(ORVALIS_SPEECH_8K "/wav/all.wav");
  speech.resize(28000);
  const std::string take = folder / "take.wav", out = folder / "out";
  write_audio(take, speech, 8000, 1, kWav16);
  const std::string bytes = test::read_file(take);
  std::string errors;
  std::map<std::string, std::string> files;
  for (const auto &[before, behind] : {std::pair{std::string("denoise "), " " + out + "/a.wav"},
                                       {"epd --no-lead-in --split " + out + " ", ""}})
    for (const bool piped : {false, true}) {
      SCOPED_TRACE(before + (piped ? "pipe" : "file"));
      const auto run = [&](Fault fault, int at) {
        const Pipe pipe(bytes);
        std::filesystem::remove_all(out);
        std::filesystem::create_directory(out);
        testing::internal::CaptureStdout();
        testing::internal::CaptureStderr();
        cli::Run tool;
        CLI::App app;
        add_detect_commands(app, tool);
        add_enhance_commands(app, tool);
        reads = {fault, at, 0};
        app.parse(before + (piped ? pipe.path() : take) + behind);
        testing::internal::GetCapturedStdout();
        errors = testing::internal::GetCapturedStderr();
        files.clear();
        for (const auto &file : std::filesystem::directory_iterator(out))
          files[file.path().filename()] = test::read_file(file.path());
        return tool.exit_status;
      };
      ASSERT_EQ(run(Fault::kNone, 0), 0) << errors;
      const auto good = files;
      ASSERT_EQ(good.size(), behind.empty() ? 2U : 1U);
      const int count = reads.calls;
      ASSERT_GT(count, 300);
      // All that open the input, and some of those alike.
      for (int at = 1; at <= count; at += at < 24 ? 1 : 97) {
        for (const Fault fault : {Fault::kInterrupted, Fault::kShort}) {
          ASSERT_EQ(run(fault, at), 0) << errors;
          ASSERT_EQ(files, good) << at;
        }
        ASSERT_EQ(run(Fault::kError, at), 1) << at;
        ASSERT_NE(errors.find(": Input/output error\n"), std::string::npos) << errors;
        // Utterances that had been found are there, as they should be.
        ASSERT_LT(files.size(), good.size()) << at;
        for (const auto &[name, content] : files) ASSERT_EQ(content, good.at(name)) << at;
      }
    }
}

TEST(AudioSource, SamplesArriveUntouchedOrRounded) {
  const TemporaryFolder folder;
  const std::string file = folder / "take";
  std::vector<short> every_value, stereo;
  for (int value = -32768; value <= 32767; ++value) {
    every_value.push_back(static_cast<short>(value));
    stereo.insert(stereo.end(), {static_cast<short>(~value), static_cast<short>(value)});
  }
  for (const int rate : {8000, 16000}) {
    write_audio(file, every_value, rate, 1, kWav16);
    EXPECT_EQ(read_all(file), every_value);
    EXPECT_EQ(AudioSource(file, {}).rate_hz(), rate);
  }
  write_audio(file, stereo, 16000, 2, SF_FORMAT_FLAC | SF_FORMAT_PCM_16);
  EXPECT_EQ(read_all(file, {.channel = 2}), every_value);
  // Every mean here is -1/2, which rounds to even.
  EXPECT_EQ(read_all(file), std::vector<short>(65536, 0));

  const float step = 1.0F / 32768;
  write_audio<float>(
      file,
      {0, 1.5F, -7, 1, -1, 0.4F * step, 0.6F * step, -0.6F * step, -300.2F * step,
       std::numeric_limits<float>::infinity(), std::numeric_limits<float>::quiet_NaN()},
      16000, 1, kWavFloat);
  EXPECT_EQ(read_all(file),
            (std::vector<short>{0, 32767, -32768, 32767, -32768, 0, 1, -1, -300, 32767, 0}));
  // 24 bits lie in the upper bytes of an int: -1, 127, 129, -129 and the largest.
  write_audio<int>(file, {-1 * 256, 127 * 256, 129 * 256, -129 * 256, 0x7fffff00}, 16000, 1,
                   SF_FORMAT_WAV | SF_FORMAT_PCM_24);
  EXPECT_EQ(read_all(file), (std::vector<short>{0, 0, 1, -1, 32767}));
}

/// Each channel is a tone of its own; the output has its time and level, and pairs are the two.
TEST(AudioSource, ResamplingKeepsTimeAndLevel) {
  const TemporaryFolder folder;
  const std::string file = folder / "tones.wav";
  const auto wave = [](int channel, double seconds) {
    return 0.5 * std::sin(2 * std::numbers::pi * (440 + 100 * channel) * seconds);
  };
  for (const int rate : {8000, 11025, 44100, 96000}) {
    SCOPED_TRACE(rate);
    // One second and a bit, so that neither rate divides it.
    std::vector<float> tones;
    for (int i = 0; i < rate + 37; ++i)
      for (const int channel : {0, 1})
        tones.push_back(static_cast<float>(wave(channel, static_cast<double>(i) / rate)));
    write_audio(file, tones, rate, 2, kWavFloat);
    const auto pairs = read_all(file, {.channels = Channels::kPair, .wide_only = true});
    for (const int channel : {0, 1}) {
      const auto samples = read_all(file, {.channel = channel + 1, .wide_only = true});
      for (const std::size_t size : {samples.size(), pairs.size() / 2})
        EXPECT_NEAR(static_cast<double>(size), 16000.0 * (rate + 37) / rate, 1);
      for (std::size_t i = 0; i < std::min(samples.size(), pairs.size() / 2); ++i)
        ASSERT_EQ(pairs[2 * i + static_cast<std::size_t>(channel)], samples[i]) << i;
      for (std::size_t i = 1000; i < 15000; ++i)
        ASSERT_NEAR(samples[i], 32768 * wave(channel, static_cast<double>(i) / 16000), 4) << i;
    }
  }
}

}  // namespace
}  // namespace orvalis::cli
