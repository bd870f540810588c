// The audio that `orvalis denoise`, `level` and `process` write.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <map>

#include "tests/cli/enhanced.h"

namespace orvalis::test {
namespace {

const std::string kPairs = "denoise --mics 2 --channels 2";

TEST_F(Enhanced, OutputIsTheStreams) {
  const Pcm mono = noisy_speech(), pairs = noisy_pairs();
  for (const int length : {1, 161, 16001, 40071}) {
    SCOPED_TRACE(length);
    const Pcm part(mono.begin(), mono.begin() + length);
    const Pcm part_of_pairs(pairs.begin(), pairs.begin() + 2 * length);
    EXPECT_EQ(through("denoise --level 13 --mics 1", part), enhanced(kDenoise, part));
    EXPECT_EQ(through("denoise --level 18", part), enhanced(kStrong, part));
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

/// Mean power in dB from sample `from` to `to`.
double power_db(const Pcm &samples, std::size_t from, std::size_t to) {
  double sum = 0;
  for (std::size_t i = from; i < to; ++i) sum += double(samples[i]) * samples[i];
  return 10 * std::log10(sum / static_cast<double>(to - from));
}

TEST_F(Enhanced, NoiseFallsInPausesAndSilenceStays) {
  const Pcm mono = noisy_speech(), pairs = noisy_pairs();
  const struct {
    std::string options;
    const Pcm &input;
    double min_db, max_db;
  } kCases[] = {
      {"denoise", mono, 12, 14.5}, {"denoise --level 18", mono, 17, 20}, {kPairs, pairs, 11, 15}};
  for (const auto &[options, input, min_db, max_db] : kCases) {
    const Pcm output = through(options, input);
    const double fall =
        power_db(mono, 16000, kPause - 1600) - power_db(output, 16000, kPause - 1600);
    std::printf("%s: noise falls by %.1f dB\n", options.c_str(), fall);
    EXPECT_GE(fall, min_db) << options;
    EXPECT_LE(fall, max_db) << options;
  }
  const Pcm silence(5000);
  for (const std::string command : {"denoise", "denoise --level 18", "level"})
    EXPECT_EQ(through(command, silence), silence) << command;
  EXPECT_EQ(through(kPairs, Pcm(10000)), silence);
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

TEST_F(Enhanced, OutputIsNoLaterThanInput) {
  const Pcm mono = noisy_speech(), pairs = noisy_pairs();
  EXPECT_EQ(lag_of(through("denoise", mono), mono), 0);
  EXPECT_EQ(lag_of(through("denoise --no-align", mono), mono), 48);
  EXPECT_EQ(lag_of(through(kPairs, pairs), mono), 0);
  EXPECT_EQ(lag_of(through(kPairs + " --no-align", pairs), mono), 160);
  EXPECT_EQ(lag_of(through("level", mono), mono), 0);

  // Speech at other rates: recorded so, and interpolated.
  const Pcm narrow = load_recording(kNarrow);
  const std::map<int, Pcm> speech = {
      {8000, Pcm(narrow.begin(), narrow.begin() + 40001)},
      {11025, Pcm(narrow.begin(), narrow.begin() + 40002)},
      {44100, [&] {
         Pcm samples;
         for (std::size_t i = 0; i + 1 < 100003; ++i) {
           const double at = static_cast<double>(i) * 160 / 441;
           const auto left = static_cast<std::size_t>(at);
           const double part = at - static_cast<double>(left);
           samples.push_back(to_sample(mono[left] * (1 - part) + mono[left + 1] * part));
         }
         return samples;
       }()}};
  for (const auto &[rate_hz, samples] : speech) {
    const std::string input = wav("in.wav", samples, rate_hz), output = folder_ / "out.wav";
    for (const std::string command : {"denoise", "process"}) {
      const Result kept = run(command + " --force --keep-rate " + input + " " + output);
      EXPECT_EQ(kept.status, 0) << kept.err;
      EXPECT_EQ(kept.err.find("converted from"), std::string::npos);
      EXPECT_EQ(kept.err.find("all above 8 kHz is gone") != std::string::npos, rate_hz > 16000);
      EXPECT_EQ(read_audio(output).info.samplerate, rate_hz);
      EXPECT_EQ(samples_in(output).size(), samples.size());
      EXPECT_EQ(lag_of(samples_in(output), samples), 0) << command << rate_hz;
    }
    const Result converted = run("denoise --force " + input + " " + output);
    EXPECT_EQ(converted.err, "orvalis: " + input + ": written at 16000 Hz, converted from " +
                                 std::to_string(rate_hz) + " Hz (--keep-rate converts back)\n");
    EXPECT_EQ(read_audio(output).info.samplerate, 16000);
    EXPECT_NEAR(static_cast<double>(samples_in(output).size()),
                static_cast<double>(samples.size()) * 16000 / rate_hz, 1);
  }
}

TEST_F(Enhanced, JobsChangeNothing) {
  const Pcm mono = noisy_speech(), pairs = noisy_pairs();
  std::string single, paired;
  for (const std::string name : {"a.wav", "b.wav", "c.wav", "d.wav"}) {
    single += wav(name, mono) + " ";
    paired += wav("pair_" + name, pairs, 16000, 2) + " ";
  }
  const std::string out = folder_ / "out";
  std::filesystem::create_directory(out);
  for (const std::string jobs : {"1", "4"}) {
    EXPECT_EQ(run("denoise -q --force --jobs " + jobs + " " + single + out).err, "");
    EXPECT_EQ(run("denoise -q --mics 2 --force --jobs " + jobs + " " + paired + out).err, "");
    EXPECT_EQ(names_in(out).size(), 8u);
    for (const std::string &name : names_in(out))
      EXPECT_EQ(samples_in(out + "/" + name),
                name.starts_with("pair") ? enhanced(kTwo, pairs) : enhanced(kDenoise, mono))
          << name;
  }
}

TEST_F(Enhanced, SeveralChannelsNeedAnOption) {
  const Pcm mono = noisy_speech();
  Pcm stereo, doubled;
  for (const std::int16_t sample : mono) {
    stereo.insert(stereo.end(), {static_cast<std::int16_t>(~sample), sample});
    doubled.insert(doubled.end(), 2, sample);
  }
  const std::string file = wav("stereo.wav", stereo, 16000, 2), out = folder_ / "out.wav";
  const std::string both = wav("both.wav", doubled, 16000, 2);
  for (const std::string command : {"denoise ", "level ", "process "}) {
    const Result refused = run(command + file + " " + out);
    EXPECT_EQ(refused.status, 1);
    for (const std::string offer : {"--mics 2", "--mix", "--channel N"})
      EXPECT_EQ(refused.err.find(offer) == std::string::npos,
                command == "level " && offer == "--mics 2")
          << refused.err;
    EXPECT_FALSE(std::filesystem::exists(out));
  }
  const Pcm expected = enhanced(kDenoise, mono);
  EXPECT_EQ(run("denoise --channel 2 " + file + " " + out).status, 0);
  EXPECT_EQ(samples_in(out), expected);
  EXPECT_EQ(run("denoise --force --mix " + both + " " + out).status, 0);
  EXPECT_EQ(samples_in(out), expected);

  const std::string three = wav("three.wav", Pcm(300), 16000, 3);
  for (const std::string &wrong : {wav("mono.wav", mono), three}) {
    const Result result = run("denoise --force --mics 2 " + wrong + " " + out);
    EXPECT_EQ(result.status, 1);
    EXPECT_NE(result.err.find("two microphones are two channels, but there "), std::string::npos);
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
  const std::string file = wav("loud.wav", samples);
  const Result result = run("level " + file + " -");
  ASSERT_EQ(result.out.size(), kWavHeader + 2 * samples.size()) << "audio and nothing else";
  EXPECT_EQ(samples_of(result.out.substr(kWavHeader)), enhanced(kLevel, samples));
  const std::string name = "orvalis: " + file;
  EXPECT_EQ(result.err,
            name + clipping_note("clipped samples of the input", samples) + name +
                ": loud for 0.50 s, first at 1.00 s\n" + name +
                clipping_note("samples of the output at full scale", enhanced(kLevel, samples)));

  // With headroom the input is scaled first; its own samples are counted all the same.
  Pcm halved;
  for (const std::int16_t sample : samples)
    halved.push_back(static_cast<std::int16_t>(std::lround(sample * std::pow(10.0, -0.3))));
  EXPECT_EQ(through("level --headroom 6", samples), enhanced(kLevel, halved));
  EXPECT_EQ(through("level --headroom 0", samples), enhanced(kLevel, samples));
  for (const std::string command : {"denoise ", "epd ", "vad "})
    EXPECT_EQ(run(command + file + (command == "denoise " ? " -" : "")).err,
              name + clipping_note("clipped samples of the input", samples));

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
  const auto error_of = [&](const std::string &arguments, const std::string &input = {}) {
    const Result result = run(arguments, input);
    EXPECT_NE(result.status, 0) << arguments;
    return result.err;
  };
  const auto has = [](const std::string &text) { return testing::HasSubstr(text); };
  const std::string mp4 = write("it's.wav", std::string(4, '\0') + "ftypM4A " + rest);
  EXPECT_THAT(error_of("epd \"" + mp4 + "\""), has("it'\\''s.wav' -f wav - | orvalis"));
  EXPECT_THAT(error_of("epd -", "\x1A\x45\xDF\xA3" + rest), has("WebM"));
  for (const std::string head : {"fLaC", "ID3", "\xFF\xFB"})
    EXPECT_THAT(error_of("epd -", head + rest), has(pipe));
  const std::string odd = wav("odd.wav", Pcm(4410), 44100);
  EXPECT_THAT(error_of("denoise --keep-rate " + odd + " " + (folder_ / "odd.opus")),
              has("Opus holds 8000, 12000, 16000, 24000 or 48000 Hz, not 44100 Hz"));
  for (const std::string command : {"epd", "denoise -o /dev/null", "energy", "spectrum"})
    EXPECT_THAT(run(command + " --raw " + odd).err, has("RIFF header")) << command;
  ChildProcess shown("script -qec '" + command("denoise " + kWide + " -") + "' /dev/null",
                     folder_.path());
  shown.finish();
  EXPECT_THAT(shown.output(), has("audio does not go to a terminal"));
}

}  // namespace
}  // namespace orvalis::test
