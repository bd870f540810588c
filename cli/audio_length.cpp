#include "cli/audio_length.h"

#include <algorithm>
#include <array>
#include <limits>
#include <string_view>

#include "cli/audio_file.h"

namespace orvalis::cli {
namespace {

/// A number in the header.
struct Field {
  std::int64_t position = 0;
  int bytes = 4;
  bool big_endian = false;

  int shift(int byte) const { return 8 * (big_endian ? bytes - 1 - byte : byte); }

  std::uint64_t largest() const { return ~std::uint64_t{0} >> (64 - 8 * bytes); }

  std::optional<std::uint64_t> read(InputBytes &input) const {
    std::array<char, 8> raw;
    if (!input.read_at(position, std::span(raw).first(static_cast<std::size_t>(bytes))))
      return std::nullopt;
    std::uint64_t value = 0;
    for (int i = 0; i < bytes; ++i)
      value |= std::uint64_t{static_cast<unsigned char>(raw[static_cast<std::size_t>(i)])}
               << shift(i);
    return value;
  }

  void show(InputBytes &input, std::uint64_t value) const {
    std::array<char, 8> raw;
    for (int i = 0; i < bytes; ++i)
      raw[static_cast<std::size_t>(i)] = static_cast<char>(value >> shift(i));
    input.show(position, std::span(raw).first(static_cast<std::size_t>(bytes)));
  }
};

/// What comes before the audio, and its length.
struct Found {
  std::int64_t start;
  Field length;
  std::uint64_t counted_too = 0;  ///< Bytes before the audio that the length includes
  std::uint64_t outer_end = 0;    ///< Of everything, if it is known
};

/// Names are told apart by their first four bytes.
struct Layout {
  std::string_view magic, audio;
  int first_chunk, name_bytes, length_bytes;
  bool big_endian;
  bool length_has_header;
  int alignment;
};
constexpr std::array<Layout, 6> kLayouts = {{{"RIFF", "data", 12, 4, 4, false, false, 2},
                                             {"RIFX", "data", 12, 4, 4, true, false, 2},
                                             {"RF64", "data", 12, 4, 4, false, false, 2},
                                             {"FORM", "SSND", 12, 4, 4, true, false, 2},
                                             {"caff", "data", 8, 4, 8, true, false, 1},
                                             {"riff", "data", 40, 16, 8, false, true, 8}}};

using Name = std::array<char, 4>;

std::string_view text_of(const Name &name) { return {name.data(), name.size()}; }

/// Programs that cannot know the length write 0, or the largest possible, less their headers or
/// rounded.
bool is_open(std::uint64_t length, int bytes) {
  if (bytes == 8) return length == 0 || length >= 0x7fffffffffff0000;
  const std::uint64_t high = length >> 16;
  return length == 0 || high == 0x7f00 || high == 0x7fff || length == 0x80000000 || high == 0xffff;
}

std::optional<Found> find_audio_chunk(InputBytes &input, const Layout &layout) {
  constexpr std::uint64_t kFarthest = std::numeric_limits<std::int64_t>::max() / 4;
  std::optional<Field> long_length;
  std::uint64_t outer_end = 0;
  if (layout.length_bytes == 4) {
    const auto outer = Field{4, 4, layout.big_endian}.read(input).value_or(0);
    if (!is_open(outer, 4)) outer_end = outer + 8;
  }
  for (std::int64_t at = layout.first_chunk;;) {
    Name name;
    const Field length{at + layout.name_bytes, layout.length_bytes, layout.big_endian};
    if (!input.read_at(at, name)) return std::nullopt;
    const auto value = length.read(input);
    if (!value && input.error() == 0 && text_of(name) == layout.audio)
      throw AudioError("cut short: the header ends before the audio");
    if (!value) return std::nullopt;
    const std::int64_t start = length.position + layout.length_bytes;
    const auto counted = static_cast<std::uint64_t>(layout.length_has_header ? start - at : 0);
    if (text_of(name) == layout.audio) {
      const bool is_long = long_length && *value == length.largest();
      return Found{start, is_long ? *long_length : length, counted, outer_end};
    }
    if (layout.magic == "RF64" && text_of(name) == "ds64") long_length = Field{start + 8, 8, false};
    if (*value < counted || *value > kFarthest) return std::nullopt;
    const auto size = static_cast<std::int64_t>(*value - counted);
    at = start + (size + layout.alignment - 1) / layout.alignment * layout.alignment;
    if (at > static_cast<std::int64_t>(kFarthest)) return std::nullopt;
  }
}

std::optional<Found> find_audio(InputBytes &input) {
  Name magic;
  if (!input.read_at(0, magic)) return std::nullopt;
  for (const bool big_endian : {true, false}) {
    if (text_of(magic) != (big_endian ? ".snd" : "dns.")) continue;
    const auto start = Field{4, 4, big_endian}.read(input);
    if (!start) return std::nullopt;
    return Found{static_cast<std::int64_t>(*start), {8, 4, big_endian}};
  }
  const auto layout = std::ranges::find(kLayouts, text_of(magic), &Layout::magic);
  if (layout == kLayouts.end()) return std::nullopt;
  return find_audio_chunk(input, *layout);
}

}  // namespace

std::optional<std::int64_t> promised_end(InputBytes &input) {
  const auto found = find_audio(input);
  const auto length = found ? found->length.read(input) : std::nullopt;
  if (!length) return std::nullopt;
  const auto start = static_cast<std::uint64_t>(found->start);
  const std::uint64_t promised = *length - std::min(*length, found->counted_too);
  const bool is_none = promised == 0 && found->outer_end > start;  // but something follows
  const bool has_length = is_none || !is_open(promised, found->length.bytes);
  if (const auto end = input.length()) {
    const auto present =
        static_cast<std::uint64_t>(std::max<std::int64_t>(*end, found->start)) - start;
    if (has_length ? promised > present : promised != present)
      found->length.show(input, std::min(present + found->counted_too, found->length.largest()));
  } else if (!has_length && promised == 0) {
    found->length.show(input, found->length.largest());
  }
  if (!has_length) return std::nullopt;
  return found->start + static_cast<std::int64_t>(std::min<std::uint64_t>(
                            promised, std::numeric_limits<std::int64_t>::max() - start));
}

}  // namespace orvalis::cli
