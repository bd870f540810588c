#include "cli/output_plan.h"

#include <fmt/format.h>
#include <fmt/ranges.h>
#include <sys/stat.h>

#include <CLI/CLI.hpp>
#include <filesystem>
#include <map>
#include <system_error>
#include <tuple>
#include <utility>

#include "cli/split.h"

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
    throw CLI::ValidationError("OUTPUT", fmt::format("{} has no known ending: choose a format with "
                                                     "--format ({})",
                                                     name, fmt::join(output_format_names(), ", ")));
  if (streamed && !can_be_streamed(format))
    throw CLI::ValidationError("OUTPUT", "a stream can be wav or raw, not " + format);
  return {name, format};
}

/// Where a name lies, however its folder is written: the nearest folder that exists, and what
/// follows.
using Place = std::tuple<dev_t, ino_t, std::string>;

Place place_of(const fs::path &name) {
  std::error_code ignored;
  const fs::path path = fs::weakly_canonical(fs::absolute(name).parent_path(), ignored);
  fs::path folder = path;
  struct stat status {};
  while (stat(folder.c_str(), &status) != 0 && folder.has_relative_path())
    folder = folder.parent_path();
  return {status.st_dev, status.st_ino, path.lexically_relative(folder) / name.filename()};
}

/// Refuses outputs that are one file.
class Distinct {
public:
  void add(const std::string &output, const std::string &input) {
    struct stat status;
    const auto [other, is_new] = input_of_place_.emplace(place_of(output), input);
    if (!is_new) refuse(other->second, input, output);
    if (stat(output.c_str(), &status) != 0 || !S_ISREG(status.st_mode)) return;
    const auto [linked, is_only] =
        input_of_file_.emplace(std::pair{status.st_dev, status.st_ino}, input);
    if (!is_only) refuse(linked->second, input, output);
  }

private:
  [[noreturn]] static void refuse(const std::string &one, const std::string &other,
                                  const std::string &output) {
    throw CLI::ValidationError("OUTPUT",
                               fmt::format("{} and {} would both become {}", one, other, output));
  }

  std::map<Place, std::string> input_of_place_;
  std::map<std::pair<dev_t, ino_t>, std::string> input_of_file_;
};

/// Refuses an output whose name a part of an input may get.
void check_parts(const std::vector<OutputTarget> &targets, const std::vector<std::string> &inputs,
                 const std::string &folder) {
  for (const OutputTarget &target : targets) {
    const fs::path name = fs::path(target.name).filename();
    if (is_streamed(target.name) || place_of(target.name) != place_of(fs::path(folder) / name))
      continue;
    for (const std::string &input : inputs)
      if (is_part_of(input, name))
        throw CLI::ValidationError(
            "--split",
            fmt::format("{} may also become the name of a part of {}", target.name, input));
  }
}

}  // namespace

OutputPlan plan_outputs(const std::vector<std::string> &inputs, const std::string &destination,
                        const std::string &format, const std::string &split_folder) {
  std::error_code ignored;
  const bool exists = fs::exists(destination, ignored);
  OutputPlan plan;
  if (fs::is_directory(destination, ignored) || destination.ends_with('/') ||
      (inputs.size() > 1 && !exists && destination != "-")) {
    plan.folder = destination;
    Distinct outputs;
    for (const std::string &input : inputs) {
      plan.targets.push_back(in_folder(destination, input, format));
      outputs.add(plan.targets.back().name, input);
    }
  } else if (inputs.size() > 1) {
    throw CLI::ValidationError(
        "OUTPUT", "several inputs need a folder for the outputs, which " + destination + " is not");
  } else {
    plan.targets = {under_name(destination, format)};
  }
  if (!split_folder.empty()) check_parts(plan.targets, inputs, split_folder);
  return plan;
}

}  // namespace orvalis::cli
