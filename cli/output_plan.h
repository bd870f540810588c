// Which output each input goes to, decided before any work begins.
#pragma once

#include <string>
#include <vector>

#include "cli/audio_output.h"

namespace orvalis::cli {

/// A single input goes to `destination`, or into it if that is a folder; several inputs need a
/// folder. `format` is what the user asks for; "" leaves it to the names. Throws
/// CLI::ValidationError.
std::vector<OutputTarget> plan_outputs(const std::vector<std::string> &inputs,
                                       const std::string &destination, const std::string &format);

}  // namespace orvalis::cli
