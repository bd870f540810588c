#include "Voice_Engine/channel/channel_plans.h"

#include <array>

#include "Voice_Engine/basic_op/constexpr_math.h"

namespace orvalis {
namespace {

struct Scale {
  Word32 factor_q15;
  Word32 shift;
};
constexpr Scale shift_by(Word32 places) { return {0, places}; }
constexpr Scale times(Word32 factor_q15) { return {factor_q15, 0}; }

template <std::size_t kChannels>
constexpr ChannelScales make_scales(const Scale (&scales)[kChannels]) {
  ChannelScales lanes{};
  for (std::size_t i = 0; i < kChannels; ++i) {
    lanes.factor_q15[i] = scales[i].factor_q15;
    lanes.shift[i] = scales[i].shift;
  }
  return lanes;
}

constexpr ChannelBins ch_tbl_vad_WB[] = {
    {0, 1},   {2, 3},   {4, 5},   {6, 7},   {8, 9},   {10, 11},  {12, 13},
    {14, 16}, {17, 19}, {20, 22}, {23, 26}, {27, 30}, {31, 35},  {36, 41},
    {42, 48}, {49, 55}, {56, 63}, {64, 73}, {74, 85}, {86, 109}, {110, 127}};

// Reciprocals of the channel widths, but for channel 19, whose 24 bins are divided by 14.
constexpr ChannelScales ch_tbl_sh_vad_WB = make_scales(
    {shift_by(1),  shift_by(1),  shift_by(1),  shift_by(1), shift_by(1), shift_by(1), shift_by(1),
     times(10922), times(10922), times(10922), shift_by(2), shift_by(2), times(6553), times(5462),
     times(4681),  times(4681),  shift_by(3),  times(3279), times(2731), times(2341), times(1820)});

constexpr ChannelBins ch_tbl_vad_NB[] = {{2, 3},   {4, 5},   {6, 7},   {8, 9},   {10, 11}, {12, 13},
                                         {14, 16}, {17, 19}, {20, 22}, {23, 26}, {27, 30}, {31, 35},
                                         {36, 41}, {42, 48}, {49, 55}, {56, 63}};

constexpr ChannelScales ch_tbl_sh_vad_NB =
    make_scales({shift_by(1), shift_by(1), shift_by(1), shift_by(1), shift_by(1), shift_by(1),
                 times(10922), times(10922), times(10922), shift_by(2), shift_by(2), times(6553),
                 times(5462), times(4681), times(4681), shift_by(3)});

constexpr ChannelBins ch_tbl[] = {{0, 1},   {2, 3},   {4, 5},   {6, 7},    {8, 10},
                                  {11, 13}, {14, 16}, {17, 19}, {20, 22},  {23, 26},
                                  {27, 30}, {31, 34}, {35, 39}, {40, 45},  {46, 52},
                                  {53, 61}, {62, 72}, {73, 87}, {88, 104}, {105, 125}};

constexpr ChannelScales ch_tbl_sh = make_scales(
    {shift_by(1),  shift_by(1),  shift_by(1), shift_by(1), times(10922), times(10922), times(10922),
     times(10922), times(10922), shift_by(2), shift_by(2), shift_by(2),  times(6553),  times(5462),
     times(4681),  times(3641),  times(2979), times(2185), times(1927),  times(1560)});

/// A window with the edges of a squared sine. Between them it is 32767, not 1, which lowers samples
/// beyond half scale by one unit.
template <std::size_t kFrame, std::size_t kEdge>
constexpr std::array<Word16, kFrame + kEdge> make_window(double full_scale) {
  std::array<Word16, kFrame + kEdge> window{};
  window.fill(MAX_16);
  for (std::size_t i = 0; i < kEdge; ++i) {
    // sin^2(pi (i + 1/2) / 2L), as a cosine of the double angle
    const double cosine = constexpr_math::cos_of_turn(static_cast<double>(i) + 0.5, 2.0 * kEdge);
    window[i] = constexpr_math::rounded_word16(full_scale * (1 - cosine) / 2);
    window[kFrame + kEdge - 1 - i] = window[i];
  }
  return window;
}

// Only the wide-band detector's edges have a full scale of 32768.
constexpr auto window_vad_WB = make_window<160, 48>(32768);
constexpr auto window_vad_NB = make_window<80, 24>(32767);
constexpr auto window = make_window<160, 48>(32767);

}  // namespace

constinit const ChannelPlan kWideBandDetection = {
    .channels = 21,
    .frame_samples = 160,
    .overlap = 48,
    .bins = ch_tbl_vad_WB,
    .scales = &ch_tbl_sh_vad_WB,
    .window = window_vad_WB.data(),
    .window_is_flat = false,
    .transform = &kWideTransform,
    .energy_floor = 12,
    .initial_noise_frames = 10,
    .scale_then_smooth = false,
    .alpha_high_level_q5 = 1638,  // 51.2 dB
    .metric_noise = 68,
    .energy_silent = 252,
    .deviation_voice = 2000,
    .remember_reset = false,
};

constinit const ChannelPlan kNarrowBandDetection = {
    .channels = 16,
    .frame_samples = 80,
    .overlap = 24,
    .bins = ch_tbl_vad_NB,
    .scales = &ch_tbl_sh_vad_NB,
    .window = window_vad_NB.data(),
    .window_is_flat = false,
    .transform = &kNarrowTransform,
    .energy_floor = 16,
    .initial_noise_frames = 10,
    .scale_then_smooth = false,
    .alpha_high_level_q5 = 1600,  // 50 dB
    .metric_noise = 45,
    .energy_silent = 256,
    .deviation_voice = 896,
    .remember_reset = false,
};

constinit const ChannelPlan kSuppression = {
    .channels = 20,
    .frame_samples = 160,
    .overlap = 48,
    .bins = ch_tbl,
    .scales = &ch_tbl_sh,
    .window = window.data(),
    .window_is_flat = true,
    .transform = &kSuppressionTransform,
    .energy_floor = 16,
    .initial_noise_frames = 4,
    .scale_then_smooth = true,
    .alpha_high_level_q5 = 1920,  // 60 dB
    .metric_noise = 42,
    .energy_silent = 320,
    .deviation_voice = 896,
    .remember_reset = true,
};

}  // namespace orvalis
