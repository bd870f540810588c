#include "Voice_Engine/ns/float_fft.h"

#include <cstring>

#include "Voice_Engine/basic_op/constexpr_math.h"
#include "Voice_Engine/ns/float_fft_kernel.h"
#include "Voice_Engine/platform/export.h"

namespace orvalis {
namespace {

constexpr Direction direction_of(int32_t direction) {
  return direction == 1 ? Direction::kForward : Direction::kInverse;
}

constexpr std::array<Complex<double>, kTransformBins> make_twiddles() {
  constexpr double kStep = -0.01227184630308513;  // -2 pi / 512
  std::array<Complex<double>, kTransformBins> table{};
  for (int k = 0; k < kTransformBins; ++k) {
    const double angle = k * kStep;
    table[k] = {constexpr_math::cos_of(angle), constexpr_math::sin_of(angle)};
  }
  return table;
}

constinit Word32 table_pending = 1;

void mark_table_made() { __atomic_store_n(&table_pending, 0, __ATOMIC_RELAXED); }

void complex_portable(Spectrum &data, Direction direction) { complex_transform(data, direction); }
void real_portable(Spectrum &data, Direction direction) { real_transform(data, direction); }
ORVALIS_WITH_FMA void complex_fused(Spectrum &data, Direction direction) {
  complex_transform(data, direction);
}
ORVALIS_WITH_FMA void real_fused(Spectrum &data, Direction direction) {
  real_transform(data, direction);
}

/// Runs a transform over the caller's floats.
template <class Transform>
void transform_in_place(Transform transform, float *data, Direction direction) {
  Spectrum spectrum;
  std::memcpy(spectrum.data(), data, sizeof spectrum);
  transform(spectrum, direction);
  std::memcpy(data, spectrum.data(), sizeof spectrum);
}

}  // namespace

constinit const std::array<Complex<double>, kTransformBins> twiddles = make_twiddles();

}  // namespace orvalis

extern "C" {

ORVALIS_EXPORT void r_fft(float *data, int32_t direction) {
  using namespace orvalis;
  if (__atomic_load_n(&table_pending, __ATOMIC_RELAXED) == 1) mark_table_made();
  transform_in_place(has_fma() ? real_fused : real_portable, data, direction_of(direction));
}

ORVALIS_EXPORT float *c_fft(float *data, int32_t direction) {
  using namespace orvalis;
  transform_in_place(has_fma() ? complex_fused : complex_portable, data, direction_of(direction));
  return data;
}

ORVALIS_EXPORT void fill_tbl(void) { orvalis::mark_table_made(); }

}  // extern "C"
