// How much audio the header of a file with chunks promises.
#pragma once

#include <cstdint>
#include <optional>

#include "cli/input_bytes.h"

namespace orvalis::cli {

/// The position at which the audio ends, by the header of a WAV, RF64, W64, AIFF, CAF or AU file;
/// none if the header leaves the length open, or of other files. If the audio is open or cut short,
/// libsndfile is shown the length that is there: it refuses some of these files, and takes an open
/// length of 0 for no audio. Throws AudioError if the input ends where the length should be.
std::optional<std::int64_t> promised_end(InputBytes &input);

}  // namespace orvalis::cli
