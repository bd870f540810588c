// Which output each input goes to.
#pragma once

#include <string>
#include <vector>

namespace orvalis::cli {

struct PlannedOutput {
  std::string name;
  std::string format;  ///< One of output_format_names
};

/// A single input goes to `destination`, or into it if that is a folder; several need a folder.
/// `format` is what the user asks for; with "" the names tell. Throws CLI::ValidationError.
std::vector<PlannedOutput> plan_outputs(const std::vector<std::string> &inputs,
                                        const std::string &destination, const std::string &format);

}  // namespace orvalis::cli
