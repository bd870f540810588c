// Quality of detection and suppression on mixtures whose parts are known: how much noise is left,
// what that costs the speech, and how soon rising noise is learnt.
#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <iterator>
#include <utility>
#include <vector>

#include "jni/orvalis.h"
#include "stream/utterance_stream.h"
#include "tests/support/noise.h"
#include "tests/support/recordings.h"

namespace orvalis::bench {
namespace {

using test::NoiseColour;
using test::Pcm;

constexpr std::size_t kRate = 16000;
constexpr std::size_t kFrame = ORVALIS_FRAME_16K;

struct Suppressor {
  int mode;
  std::size_t microphones;
  std::size_t delay;
};
constexpr Suppressor kSuppressors[] = {{ORVALIS_NS_13DB, 1, ORVALIS_NS_DELAY_1MIC},
                                       {ORVALIS_NS_18DB, 1, ORVALIS_NS_DELAY_1MIC},
                                       {ORVALIS_NS_13DB, 2, ORVALIS_NS_DELAY_2MIC}};

/// The first microphone without its noise, the delay made up for. The second is not always used.
Pcm suppressed(const Suppressor &suppressor, const Pcm &first, const Pcm &second) {
  const auto &[mode, microphones, delay] = suppressor;
  const auto count = static_cast<std::int32_t>(kFrame * microphones);
  NsInstance *ns = InitializeDoNS(mode, static_cast<std::int32_t>(microphones), 0);
  Pcm output, in(kFrame * microphones), out(in.size());
  for (std::size_t at = 0; output.size() < first.size() + delay; at += kFrame) {
    for (std::size_t i = 0; i < in.size(); ++i) {
      const std::size_t now = std::min(at + i / microphones, first.size() - 1);
      in[i] = i % microphones == 0 ? first[now] : second[now];
      out[i] = now < delay ? std::int16_t{0} : first[now - delay];
    }
    ProcessDoNSFrame(ns, in.data(), count, out.data(), count);
    for (std::size_t i = 0; i < out.size(); i += microphones) output.push_back(out[i]);
  }
  FreeMemoryNS(ns);
  output.erase(output.begin(), output.begin() + static_cast<std::ptrdiff_t>(delay));
  output.resize(first.size());
  return output;
}

/// Samples from `begin` to `end`.
struct Range {
  std::size_t begin, end;
};

/// Mean power of `audio` less `known`.
double power(const Pcm &audio, const Pcm &known, Range range) {
  double sum = 0;
  for (std::size_t i = range.begin; i < range.end; ++i) sum += std::pow(audio[i] - known[i], 2);
  return sum / static_cast<double>(range.end - range.begin);
}

constexpr double kFullScale = 32768;
double db(double power_ratio) { return 10 * std::log10(power_ratio); }
double dbfs(double power) { return db(power / (kFullScale * kFullScale)); }

const std::pair<const char *, NoiseColour> kColours[] = {{"white", NoiseColour::kWhite},
                                                         {"pink", NoiseColour::kPink}};

/// Five sentences, each after four seconds of noise alone. What is no speech is noise, or error
/// where it lies beside the speech; a recording's own noise counts as its speech.
void print_noise_and_error() {
  std::printf(
      "one microphone   noise in the pause [dBFS]   error beside the speech [dBFS]\n"
      "                 input   13 dB   18 dB       input   13 dB   18 dB\n");
  for (const auto &[name, colour] : kColours) {
    for (const double below_db : {30.0, 20.0, 10.0, 0.0}) {
      double pause[3]{}, speech[3]{};
      for (const char *sentence : test::kSentences) {
        const Pcm words = test::speech_16k(sentence);
        const std::size_t margin = 4 * kRate;
        const Pcm noisy =
            test::in_noise(words, margin, colour, test::speech_level(words, kRate) - below_db);
        Pcm clean(noisy.size());
        std::copy(words.begin(), words.end(), clean.begin() + margin);
        const Pcm versions[] = {noisy, suppressed(kSuppressors[0], noisy, noisy),
                                suppressed(kSuppressors[1], noisy, noisy)};
        for (std::size_t i = 0; i < 3; ++i) {
          pause[i] += power(versions[i], clean, {margin / 2, margin - kFrame});
          speech[i] += power(versions[i], clean, {margin, margin + words.size()});
        }
      }
      std::printf("%-5s at %2.0f dB ", name, below_db);
      for (const double sum : pause) std::printf(" %7.1f", dbfs(sum / 5));
      std::printf("    ");
      for (const double sum : speech) std::printf(" %7.1f", dbfs(sum / 5));
      std::printf("\n");
    }
  }
}

/// Noise that is louder in its second half.
Pcm rising(NoiseColour colour, unsigned seed, std::size_t samples, double from_dbfs, double by_db) {
  Pcm pcm;
  for (const double value : test::unit_noise(samples, colour, seed)) {
    const double level_db = from_dbfs + (pcm.size() < samples / 2 ? 0 : by_db);
    pcm.push_back(test::to_sample(kFullScale * std::pow(10, level_db / 20) * value));
  }
  return pcm;
}

/// Seconds from the rise until half a second passes less than 2 dB more of the noise than the end;
/// negative if the end passes more than before the rise.
double learning_time(const Suppressor &suppressor, const Pcm &first, const Pcm &second) {
  const Pcm output = suppressed(suppressor, first, second), silence(first.size());
  const auto change = [&](std::size_t begin, std::size_t end) {
    return db(power(output, silence, {begin, end}) / power(first, silence, {begin, end}));
  };
  const std::size_t rise = first.size() / 2, tail = 20 * kRate;
  const double final_db = change(first.size() - tail, first.size());
  if (final_db > change(rise - tail, rise) + 2) return -1;
  std::size_t at = rise;
  while (change(at, at + kRate / 2) > final_db + 2) at += kFrame;
  return static_cast<double>(at - rise) / kRate;
}

/// Seconds that the detector takes for speech; negative if it does to the end.
double speech_time(const Pcm &pcm, std::int32_t rate_hz) {
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  settings.rate_hz = rate_hz;
  settings.pad_before_ms = settings.pad_after_ms = 0;
  UtteranceStream *stream = OpenUtteranceStream(&settings);
  PushUtteranceAudio(stream, pcm.data(), static_cast<std::int32_t>(pcm.size()));
  FlushUtteranceStream(stream);
  std::int64_t samples = 0;
  bool ended = true;
  for (Utterance found; NextUtterance(stream, &found) == 1; ended = found.open == 0)
    samples += found.end - found.start;
  CloseUtteranceStream(stream);
  return ended ? static_cast<double>(samples) / rate_hz : -1;
}

void print_seconds(double seconds) {
  if (seconds < 0) {
    std::printf("   never");
  } else {
    std::printf(" %7.2f", seconds);
  }
}

/// A minute at a level, then a minute at a higher one.
void print_learning() {
  std::printf(
      "noise that rises      until it is suppressed again [s]    until it is no more speech [s]\n"
      "                      13 dB   18 dB   two microphones     16 kHz   8 kHz\n");
  for (const auto &[name, colour] : kColours) {
    for (const auto &[from_dbfs, by_db] :
         {std::pair(-60., 6.), {-60., 20.}, {-50., 10.}, {-40., 10.}, {-40., 20.}}) {
      const Pcm first = rising(colour, 1, 120 * kRate, from_dbfs, by_db);
      const Pcm second = rising(colour, 2, 120 * kRate, from_dbfs, by_db);
      std::printf("%-5s %3.0f to %3.0f dBFS ", name, from_dbfs, from_dbfs + by_db);
      for (const Suppressor &suppressor : kSuppressors)
        print_seconds(learning_time(suppressor, first, second));
      std::printf("          ");
      print_seconds(speech_time(first, 16000));
      print_seconds(speech_time(rising(colour, 1, 120 * 8000, from_dbfs, by_db), 8000));
      std::printf("\n");
    }
  }
}

}  // namespace
}  // namespace orvalis::bench

int main() {
  SetLogSink(LogNothing, nullptr);
  orvalis::bench::print_noise_and_error();
  std::printf("\n");
  orvalis::bench::print_learning();
}
