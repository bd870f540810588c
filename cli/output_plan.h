// Which output each input goes to, decided before any work begins.
#pragma once

#include <string>
#include <vector>

#include "cli/audio_output.h"

namespace orvalis::cli {

struct OutputPlan {
  std::vector<OutputTarget> targets;  ///< One for each input
  std::string folder;                 ///< Holds them all and may have to be created; or ""
};

/// A single input goes to `destination`, or into it if that is a folder or is written like one,
/// with
/// "/" at its end; several inputs go into a folder. `format` is what the user asks for; "" leaves
/// it to the names. `split_folder` gets the parts of the inputs, unless it is "". Throws
/// CLI::ValidationError, also if two outputs would be the same file.
OutputPlan plan_outputs(const std::vector<std::string> &inputs, const std::string &destination,
                        const std::string &format, const std::string &split_folder);

}  // namespace orvalis::cli
