#include "cli/output_plan.h"

#include <fmt/format.h>
#include <fmt/ranges.h>

#include <CLI/CLI.hpp>
#include <filesystem>
#include <map>
#include <system_error>

namespace orvalis::cli {
namespace {

namespace fs = std::filesystem;

/// In a folder, an output gets the input's name, and its format if that can be written.
OutputTarget in_folder(const std::string &folder, const std::string &input, std::string format) {
  const fs::path name = file_name_of(input);
  const std::string own_format = format_of_name(name);
  if (format.empty()) format = own_format.empty() ? "wav" : own_format;
  const bool keeps_name = format == own_format;
  const fs::path output = keeps_name ? name : fs::path(name.stem().string() + "." + format);
  return {fs::path(folder) / output, format};
}

OutputTarget under_name(const std::string &name, std::string format) {
  if (format.empty()) format = format_of_name(name);
  const bool streamed = is_streamed(name);
  if (format.empty() && streamed) format = "wav";
  if (format.empty())
    throw CLI::ValidationError("FILE", fmt::format("{} has no known ending: choose a format with "
                                                   "--format ({})",
                                                   name, fmt::join(output_format_names(), ", ")));
  if (streamed && !can_be_streamed(format))
    throw CLI::ValidationError("FILE", "a stream can be wav or raw, not " + format);
  return {name, format};
}

}  // namespace

std::vector<OutputTarget> plan_outputs(const std::vector<std::string> &inputs,
                                       const std::string &destination, const std::string &format) {
  std::error_code ignored;
  if (!fs::is_directory(destination, ignored)) {
    if (inputs.size() > 1)
      throw CLI::ValidationError(
          "OUT", "several inputs need a folder for the outputs, which " + destination + " is not");
    return {under_name(destination, format)};
  }
  std::vector<OutputTarget> outputs;
  std::map<std::string, std::string> input_of_output;
  for (const std::string &input : inputs) {
    outputs.push_back(in_folder(destination, input, format));
    const auto [other, is_new] = input_of_output.emplace(outputs.back().name, input);
    if (!is_new)
      throw CLI::ValidationError("FILE", fmt::format("{} and {} would both become {}",
                                                     other->second, input, other->first));
  }
  return outputs;
}

}  // namespace orvalis::cli
