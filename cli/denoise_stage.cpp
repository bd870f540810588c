#include "cli/denoise_stage.h"

#include <algorithm>
#include <new>

namespace orvalis::cli {
namespace {

constexpr std::size_t kDelayOfOne = 48;
constexpr std::size_t kDelayOfTwo = 160;

}  // namespace

DenoiseStage::DenoiseStage(const DenoiseSettings &settings)
    : FrameStage(static_cast<std::size_t>(settings.microphones),
                 settings.microphones == 2 ? kDelayOfTwo : kDelayOfOne, settings.aligned),
      ns_(InitializeDoNS(settings.level_db == 18 ? 2 : 0, settings.microphones, 0)) {
  if (!ns_) throw std::bad_alloc();
}

void DenoiseStage::work(std::span<const std::int16_t> input, OutputFrame output) {
  // The engine writes into what it is given, and gives as many channels.
  std::array<std::int16_t, 2 * kFrameSamples> in, out;
  const std::size_t channels = input.size() / kFrameSamples;
  std::ranges::copy(input, in.begin());
  for (std::size_t i = 0; i < input.size(); ++i) out[i] = output[i / channels];
  const auto count = static_cast<std::int32_t>(input.size());
  ProcessDoNSFrame(ns_.get(), in.data(), count, out.data(), count);
  for (std::size_t i = 0; i < kFrameSamples; ++i) output[i] = out[i * channels];
}

}  // namespace orvalis::cli
