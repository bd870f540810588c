// The audio that `orvalis denoise`, `level` and `process` write.
#include <gmock/gmock.h>

#include <array>
#include <cmath>
#include <cstdio>

#include "tests/cli/tool.h"

namespace orvalis::test {
namespace {

using Enhanced = Tool;
using testing::HasSubstr;

constexpr EnhancementSettings kLate = {1, 13, 0, 0}, kTwo = {2, 13, 0, 1};
const std::string kPairs = "denoise --mics 2 --channels 2";

/// A card's name in white noise, after a pause.
Pcm noisy_speech(unsigned seed = 1) {
  constexpr std::size_t kPause = 16000;
  const Pcm speech = load_recording(kWide);
  Pcm samples;
  for (const double noise : unit_noise(kPause + speech.size(), NoiseColour::kWhite, seed)) {
    const std::size_t i = samples.size();
    samples.push_back(to_sample(100 * noise + (i < kPause ? 0 : speech[i - kPause])));
  }
  return samples;
}

TEST_F(Enhanced, OutputIsTheStreams) {
  const Pcm mono = noisy_speech(), pairs = interleaved(mono, noisy_speech(2));
  for (const int length : {1, 161, 40071}) {
    SCOPED_TRACE(length);
    const Pcm part(mono.begin(), mono.begin() + length);
    const Pcm part_of_pairs(pairs.begin(), pairs.begin() + 2 * length);
    EXPECT_EQ(through("denoise --level 13 --mics 1", part), enhanced(kDenoise, part));
    EXPECT_EQ(through("denoise --level 18", part), enhanced({1, 18, 0, 1}, part));
    EXPECT_EQ(through(kPairs, part_of_pairs), enhanced(kTwo, part_of_pairs));
    EXPECT_EQ(through("level", part), enhanced(kLevel, part));
    Pcm late = enhanced(kLate, part);
    late.resize(part.size());  // as long as the input all the same
    EXPECT_EQ(through("denoise --no-align", part), late);
    const std::string file = wav("part.wav", part, 44100);
    EXPECT_EQ(run("process --force --keep-rate " + file + " " + (folder_ / "out.wav")).status, 0);
    EXPECT_EQ(read_audio(folder_ / "out.wav").samples.size(), part.size());
  }
}

/// The lag of `late` behind `early` of their largest correlation.
int lag_of(const Pcm &late, const Pcm &early) {
  constexpr int kMaxLag = 200;
  double best = 0;
  int lag_of_best = -kMaxLag - 1;
  for (int lag = -kMaxLag; lag <= kMaxLag; ++lag) {
    double sum = 0;
    for (int i = kMaxLag; i + kMaxLag < std::min(std::ssize(late), std::ssize(early)); ++i)
      sum += double(late[static_cast<std::size_t>(i + lag)]) * early[static_cast<std::size_t>(i)];
    if (sum > best) {
      best = sum;
      lag_of_best = lag;
    }
  }
  return lag_of_best;
}

TEST_F(Enhanced, OutputIsNoLaterThanInputAtAnyRate) {
  // Speech at 8 kHz, and the same as if it had been recorded faster.
  Pcm speech = load_recording(kNarrow);
  speech.resize(40002);
  for (const int rate_hz : {8000, 11025, 44100}) {
    SCOPED_TRACE(rate_hz);
    const std::string input = wav("in.wav", speech, rate_hz), output = folder_ / "out.wav";
    for (const std::string command : {"denoise", "process"}) {
      const Result kept = run(command + " --force --keep-rate " + input + " " + output);
      EXPECT_EQ(kept.status, 0) << kept.err;
      EXPECT_EQ(kept.err.find("converted from"), std::string::npos);
      EXPECT_EQ(kept.err.find("all above 8 kHz is gone") != std::string::npos, rate_hz > 16000);
      EXPECT_EQ(read_audio(output).info.samplerate, rate_hz);
      EXPECT_EQ(samples_in(output).size(), speech.size());
      EXPECT_EQ(lag_of(samples_in(output), speech), 0) << command;
    }
    const Result converted = run("denoise --force " + input + " " + output);
    EXPECT_EQ(converted.err, "orvalis: " + input + ": written at 16000 Hz, converted from " +
                                 std::to_string(rate_hz) + " Hz (--keep-rate converts back)\n");
    EXPECT_EQ(read_audio(output).info.samplerate, 16000);
    EXPECT_NEAR(static_cast<double>(samples_in(output).size()), 40002.0 * 16000 / rate_hz, 1);
  }
}

TEST_F(Enhanced, SeveralChannelsNeedAnOption) {
  const Pcm mono = noisy_speech();
  Pcm inverted;
  for (const std::int16_t sample : mono) inverted.push_back(static_cast<std::int16_t>(~sample));
  const std::string file = wav("stereo.wav", interleaved(inverted, mono), 16000, 2);
  const std::string both = wav("both.wav", interleaved(mono, mono), 16000, 2);
  const std::string out = folder_ / "out.wav";
  for (const std::string command : {"denoise ", "level ", "process "}) {
    const Result refused = run(command + file + " " + out);
    EXPECT_EQ(refused.status, 1);
    for (const std::string offer : {"--mics 2", "--mix", "--channel N"})
      EXPECT_EQ(refused.err.find(offer) == std::string::npos,
                command == "level " && offer == "--mics 2")
          << refused.err;
    EXPECT_FALSE(fs::exists(out));
  }
  for (const std::string &chosen : {"--channel 2 " + file, "--mix " + both}) {
    EXPECT_EQ(run("denoise --force " + chosen + " " + out).status, 0);
    EXPECT_EQ(samples_in(out), enhanced(kDenoise, mono)) << chosen;
  }
  // Pairs of files, several at once.
  const std::string pairs = folder_ / "pairs";
  EXPECT_EQ(run("denoise -q -j 2 --mics 2 " + file + " " + both + " " + pairs).err, "");
  EXPECT_EQ(samples_in(pairs + "/both.wav"), enhanced(kTwo, interleaved(mono, mono)));
  EXPECT_EQ(samples_in(pairs + "/stereo.wav"), enhanced(kTwo, interleaved(inverted, mono)));
  for (const std::string &wrong : {wav("mono.wav", mono), wav("three.wav", Pcm(300), 16000, 3)}) {
    const Result result = run("denoise --force --mics 2 " + wrong + " " + out);
    EXPECT_EQ(result.status, 1);
    EXPECT_THAT(result.err, HasSubstr("two microphones are two channels, but there "));
  }
}

/// The tool's note on samples at full scale, all of which have neighbours.
std::string clipping_note(const char *what, const Pcm &samples) {
  const auto clipped = [](std::int16_t sample) { return sample == 32767 || sample == -32768; };
  std::array<char, 100> text;
  std::snprintf(
      text.data(), text.size(), ": %s: %d, the first at %.3f s\n", what,
      static_cast<int>(std::ranges::count_if(samples, clipped)),
      static_cast<double>(std::ranges::find_if(samples, clipped) - samples.begin()) / 16000);
  return text.data();
}

TEST_F(Enhanced, LevelReportsWhatIsLoudOrClipped) {
  // A second of a tone that is not loud, then half a second of one that is and clips.
  Pcm samples;
  for (int i = 0; i < 24000; ++i)
    samples.push_back(to_sample((i < 16000 ? 2000 : 40000) * std::sin(i * 0.1)));
  const std::string file = wav("loud.wav", samples), name = "orvalis: " + file;
  const std::string input = name + clipping_note("clipped samples of the input", samples);
  const Pcm expected = enhanced(kLevel, samples);
  const Result result = run("level " + file + " -");
  ASSERT_EQ(result.out.size(), kWavHeader + 2 * samples.size()) << "audio and nothing else";
  EXPECT_EQ(samples_of(result.out.substr(kWavHeader)), expected);
  EXPECT_EQ(result.err, input + name + ": loud for 0.50 s, first at 1.00 s\n" + name +
                            clipping_note("samples of the output at full scale", expected));

  // With headroom the input is scaled first; its own samples are counted all the same.
  Pcm halved;
  for (const std::int16_t sample : samples)
    halved.push_back(static_cast<std::int16_t>(std::lround(sample * std::pow(10.0, -0.3))));
  EXPECT_EQ(through("level --headroom 6", samples), enhanced(kLevel, halved));
  for (const std::string command : {"denoise -o /dev/null ", "epd ", "vad "})
    EXPECT_EQ(run(command + file).err, input);

  samples.resize(16000);
  EXPECT_EQ(run("level " + wav("quiet.wav", samples) + " " + (folder_ / "out.wav")).err, "");
}

TEST_F(Enhanced, ProcessIsDenoiseThenLevelThenEpd) {
  const Pcm mono = noisy_speech();
  const std::string file = wav("take.wav", mono), out = folder_ / "out.wav";
  const std::string options = "--hangover 900 --pad-before 50 --pad-after 40 --content-type 2 ";
  const Result result = run("process --level 18 --report json --split " + (folder_ / "parts ") +
                            options + file + " " + out);
  EXPECT_EQ(result.status, 0) << result.err;
  const Pcm expected = enhanced({1, 18, 1, 1}, mono);
  EXPECT_EQ(samples_in(out), expected);
  auto found = json_lines(result.out);
  ASSERT_FALSE(found.empty());
  for (std::size_t i = 0; i < found.size(); ++i) {
    EXPECT_EQ(found[i]["file"], file);
    const Pcm part = samples_in((folder_ / "parts/take-00") + std::to_string(i + 1) + ".wav");
    EXPECT_EQ(part, Pcm(expected.begin() + found[i]["start_sample"].get<int>(),
                        expected.begin() + found[i]["end_sample"].get<int>()));
    found[i].erase("file");
  }
  EXPECT_EQ(found, unnamed(options + out));

  // With the audio on standard output, the report goes where the notes go.
  const Result plain = run("process " + file + " " + (folder_ / "plain.wav"));
  for (const std::string standard_output : {"-", "/dev/stdout"}) {
    const Result streamed = run("process --format raw " + file + " " + standard_output);
    EXPECT_EQ(samples_of(streamed.out), samples_in(folder_ / "plain.wav"));
    EXPECT_EQ(streamed.err, plain.out + plain.err);
  }
}

TEST_F(Enhanced, FormatsThatDoNotFitAreRefusedWithTheWayOut) {
  const std::string pipe = "ffmpeg -i - -f wav - |", rest(100, '\0');
  const std::string mp4 = write("it's.wav", std::string(4, '\0') + "ftypM4A " + rest);
  const std::string odd = wav("odd.wav", Pcm(4410), 44100);
  const struct {
    std::string arguments, input, says;
  } kCases[] = {{"epd \"" + mp4 + "\"", "", "it'\\''s.wav' -f wav - | orvalis"},
                {"epd -", "\x1A\x45\xDF\xA3" + rest, "WebM"},
                {"epd -", "fLaC" + rest, pipe},
                {"epd -", "ID3" + rest, pipe},
                {"epd -", "\xFF\xFB" + rest, pipe},
                {"denoise --keep-rate " + odd + " " + (folder_ / "odd.opus"), "",
                 "Opus holds 8000, 12000, 16000, 24000 or 48000 Hz, not 44100 Hz"}};
  for (const auto &[arguments, input, says] : kCases) {
    const Result refused = run(arguments, input);
    EXPECT_EQ(refused.status, 1) << arguments;
    EXPECT_THAT(refused.err, HasSubstr(says)) << arguments;
  }
  for (const std::string command : {"epd", "denoise -o /dev/null", "energy"})
    EXPECT_THAT(run(command + " --raw " + odd).err, HasSubstr("RIFF header")) << command;
}

}  // namespace
}  // namespace orvalis::test
