// What a frame of 10 ms costs in parts of the services, by the best bodies: transforms of a frame,
// and functions of as many samples as a spectrum has bins. Google Benchmark's options work, such as
// --benchmark_filter=fft.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <iterator>

#include "Voice_Engine/MCRAvad/Math_baseop.h"
#include "Voice_Engine/MCRAvad/noscale_fft_512p.h"
#include "Voice_Engine/epd/fixed_fft.h"
#include "Voice_Engine/ns/float_fft.h"
#include "bench/signals.h"

namespace orvalis::bench {
namespace {

/// `part` runs in place over a frame of speech followed by zeros.
template <class Sample = Word16, std::size_t kSize = 256, class Part>
void measure(const char *name, const ServiceKind &kind, Part part) {
  benchmark::RegisterBenchmark(name, [part, &kind](benchmark::State &state) {
    const Signal speech = speech_for(kind);
    Sample buffer[kSize] = {};
    std::size_t number = 0;
    for (auto _ : state) {
      std::fill(std::copy_n(speech.frame(number++), speech.frame_samples, buffer), std::end(buffer),
                Sample{0});
      part(buffer);
      benchmark::DoNotOptimize(buffer);
    }
  });
}

/// `function` of as many samples as a spectrum has bins.
template <class Function>
auto of_every_bin(Function function) {
  return [function](const Word16 *x) {
    for (int bin = 0; bin < 128; ++bin) benchmark::DoNotOptimize(function(x[bin]));
  };
}

template <int kPoints, class FrameSpectrum>
auto spectrum_by(FrameSpectrum frame_spectrum) {
  return [frame_spectrum](const Word16 *x) {
    Word32 re[kPoints];
    Word32 im[kPoints];
    frame_spectrum(x, 160, re, im);
    benchmark::DoNotOptimize(re);
    benchmark::DoNotOptimize(im);
  };
}

void register_parts() {
  measure("c_fft_epd, band 0", kDetection16, [](Word16 *x) { c_fft_epd(x, 1, 0); });
  measure("c_fft_epd, band 1", kDetection8, [](Word16 *x) { c_fft_epd(x, 1, 1); });
  measure("r_fft_epd, band 0", kDetection16, [](Word16 *x) { r_fft_epd(x, 1, 0); });
  measure("r_fft_epd, band 1", kDetection8, [](Word16 *x) { r_fft_epd(x, 1, 1); });
  measure("c_fft_ns", kOneMicrophone, [](Word16 *x) { c_fft_ns(x, 1); });
  measure("r_fft_ns", kOneMicrophone, [](Word16 *x) { r_fft_ns(x, 1); });
  measure<float, 512>("r_fft", kOneMicrophone, [](float *x) { r_fft(x, 1); });
  measure("Noscale_FFT, 256 points", kMcraDetection,
          spectrum_by<256>(Noscale_FFT_256p_Frame_64bit));
  measure("Noscale_FFT, 512 points", kMcraDetection, spectrum_by<512>(Noscale_FFT_512p_Frame));
  measure("ZOLT_L_log, 128 times", kMcraDetection,
          of_every_bin([](Word16 x) { return ZOLT_L_log(x & 0xFFFF); }));
  measure("ZOLT_L_exp, 128 times", kMcraDetection,
          of_every_bin([](Word16 x) { return ZOLT_L_exp(-0x8000 * x); }));
  measure("ZOLT_L64_div, 128 times", kMcraDetection,
          of_every_bin([](Word16 x) { return ZOLT_L64_div(int64_t{x} << 40, 0x12345678); }));
  measure("ZOLT_expintFix, 128 times", kMcraDetection, of_every_bin(ZOLT_expintFix));
}

}  // namespace
}  // namespace orvalis::bench

int main(int argc, char **argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 2;
  orvalis::bench::register_parts();
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
}
