// The files that `orvalis epd` writes: utterances of their own, and the engine's dump files.
#include <gmock/gmock.h>

#include <cmath>

#include "tests/cli/tool.h"

namespace orvalis::test {
namespace {

class Split : public Tool {
protected:
  /// Splits an input and compares each part with the samples of `source`.
  void expect_parts(const std::string &input, const std::string &stem, const Audio &source,
                    int subtype, const std::string &bytes = {}) const {
    SCOPED_TRACE(input);
    const fs::path parts = folder_ / "new/parts";
    const auto found = epd("--pad-before 33 --split " + parts.string() + " " + input, bytes);
    ASSERT_GE(found.size(), 2u);
    EXPECT_EQ(names_in(parts).size(), found.size());
    for (std::size_t i = 0; i < found.size(); ++i) {
      const Audio part = read_audio(parts / (stem + "-00" + std::to_string(i + 1) + ".wav"));
      EXPECT_EQ(part.info.format, SF_FORMAT_WAV | subtype);
      EXPECT_EQ(part.info.samplerate, source.info.samplerate);
      ASSERT_EQ(part.info.channels, source.info.channels);
      const auto value_at = [&](const char *moment) {
        const double frame = found[i][moment].get<double>() * source.info.samplerate;
        return source.samples.begin() + std::lround(frame) * source.info.channels;
      };
      EXPECT_EQ(part.samples, std::vector(value_at("start"), value_at("end")));
    }
    fs::remove_all(parts);
  }
};

TEST_F(Split, PartsAreTheSourcesOwnSamples) {
  const struct {
    const char *name;
    int rate_hz, channels, format, subtype_of_parts;
  } kCases[] = {
      {"stereo.wav", 44100, 2, kWav16, SF_FORMAT_PCM_16},
      {"fine.flac", 16000, 3, SF_FORMAT_FLAC | SF_FORMAT_PCM_24, SF_FORMAT_PCM_24},
      {"coarse.au", 11025, 1, SF_FORMAT_AU | SF_FORMAT_PCM_S8, SF_FORMAT_PCM_U8},
      {"companded.wav", 8000, 1, SF_FORMAT_WAV | SF_FORMAT_ULAW, SF_FORMAT_ULAW},
      {"exact.wav", 48000, 1, SF_FORMAT_WAV | SF_FORMAT_DOUBLE, SF_FORMAT_DOUBLE},
      {"lossy.ogg", 16000, 1, SF_FORMAT_OGG | SF_FORMAT_VORBIS, SF_FORMAT_FLOAT},
  };
  const Pcm speech = load_recording(kNarrow);
  for (const auto &[name, rate_hz, channels, format, subtype] : kCases) {
    std::vector<int> samples;
    for (int frame = 0; frame < 12 * rate_hz; ++frame) {
      const int sample = speech[static_cast<std::size_t>(frame * 8000LL / rate_hz)];
      // The channels differ in the lower bits, which 16-bit samples do not have.
      for (int c = 0; c < channels; ++c)
        samples.push_back(sample * 65536 + (frame + c) % 256 * 256);
    }
    const std::string file = folder_ / name;
    write_audio(file, samples, rate_hz, channels, format);
    expect_parts(file, fs::path(name).stem(), read_audio(file), subtype);
  }
}

TEST_F(Split, PartsOfRawFilesAndPipesAreWhatTheEngineWasGiven) {
  // All of it, so that much is forgotten on the way; and one of two channels.
  const Audio audio = read_audio(kNarrow);
  const Pcm pcm = load_recording(kNarrow);
  const std::string raw = "--raw --rate 8000 ", file = write("all.raw", bytes_of(pcm));
  expect_parts(raw + file, "all", audio, SF_FORMAT_PCM_16);
  expect_parts("-", "stdin", audio, SF_FORMAT_PCM_16, read_file(kNarrow));
  expect_parts("- <" + kNarrow, "stdin", audio, SF_FORMAT_PCM_16);
  expect_parts(raw + "--channels 2 --channel 2 -", "stdin", audio, SF_FORMAT_PCM_16,
               bytes_of(interleaved(Pcm(pcm.size()), pcm)));

  // An utterance of two minutes and more does not stay in memory.
  std::string longer;
  for (int i = 0; i < 3; ++i) longer += bytes_of(pcm);
  const std::string parts = folder_ / "parts";
  const auto found = epd(raw + "--hangover 5s --split " + parts + " -", longer);
  ASSERT_EQ(found.size(), 1u);
  const std::size_t start = found[0]["start_sample"];
  EXPECT_EQ(bytes_of(samples_in(parts + "/stdin-001.wav")),
            longer.substr(2 * start, 2 * (found[0]["end_sample"].get<std::size_t>() - start)));
}

TEST_F(Split, FilesThatAreThereAreReplacedOnlyByForceAndNoneIsHalfWritten) {
  const std::string parts = folder_ / "parts", split = "epd -q --split " + parts + " " + kNarrow;
  // A part of 33484 bytes fits; the second has 98604.
  const Result large = shell("ulimit -f 128; " + command(split));
  EXPECT_EQ(large.status, 1);
  EXPECT_EQ(large.err, "orvalis: " + kNarrow + ": " + parts + "/all-002.wav: File too large\n");
  EXPECT_EQ(names_in(parts), Names{"all-001.wav"});
  fs::remove(parts + "/all-001.wav");

  const std::string there = write("parts/all-002.wav", "a letter");
  const Result refused = run(split + " " + kWide);
  EXPECT_EQ(refused.status, 1);
  EXPECT_EQ(refused.err,
            "orvalis: " + kNarrow + ": " + there + ": the file exists; --force replaces it\n");
  EXPECT_EQ(read_file(there), "a letter");
  EXPECT_EQ(names_in(parts), (Names{"005-001.wav", "all-001.wav", "all-002.wav"}))
      << "the other input is done";
  EXPECT_EQ(refused.out.find("\n        2 "), std::string::npos) << "no part, no report";
  EXPECT_EQ(run(split + " --force").status, 0);
  EXPECT_EQ(read_audio(there).info.samplerate, 8000);

  for (const std::string option : {"--split", "--dump"}) {
    const Result result = run("epd " + option + " " + kNarrow + " " + kWide);
    EXPECT_EQ(result.status, 1) << "a file is no folder";
    EXPECT_EQ(result.err.find("orvalis: " + option + " " + kNarrow), 0u) << result.err;
    EXPECT_EQ(result.out, "");
  }
}

TEST_F(Split, DumpsHoldInputAndDecisions) {
  const std::string root = folder_ / "dump", name = root + "/sdcard/VRpreprocess/005";
  const auto frames = epd("--frames --dump " + root + " " + kWide);
  const Pcm decided = load_recording(name + "_resultEPD.pcm");
  Pcm expected = load_recording(kWide);
  expected.resize(expected.size() / 160 * 160);
  EXPECT_EQ(load_recording(name + "_inputEPD.pcm"), expected);
  ASSERT_EQ(decided.size(), 160 * frames.size());
  for (std::size_t i = 0; i < decided.size(); ++i)
    ASSERT_EQ(decided[i] >= 1000, frames[i / 160]["answer"] == 1) << i;
  // Another run takes another name.
  epd("--dump " + root + " " + kWide);
  EXPECT_EQ(load_recording(name + "-2_resultEPD.pcm"), decided);

  const Result full =
      shell("ulimit -f 64; " + command("epd --dump " + (folder_ / "full ") + kWide));
  EXPECT_EQ(full.status, 1);
  EXPECT_THAT(full.err, testing::HasSubstr(
                            "005_inputEPD.pcm: the dump is incomplete, 32768 bytes of 112000"));
}

}  // namespace
}  // namespace orvalis::test
