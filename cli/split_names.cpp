#include "cli/split_names.h"

#include <fmt/format.h>

#include <filesystem>
#include <map>

namespace orvalis::cli {
namespace {

std::string stem_of(const std::string &input) {
  return input == "-" ? "stdin" : std::filesystem::path(input).stem().string();
}

}  // namespace

std::string part_name(const std::string &folder, const std::string &input, int number) {
  return std::filesystem::path(folder) / fmt::format("{}-{:03}.wav", stem_of(input), number);
}

std::string same_parts(const std::vector<std::string> &inputs) {
  std::map<std::string, std::string> input_of_stem;
  for (const std::string &input : inputs) {
    const auto [other, is_new] = input_of_stem.emplace(stem_of(input), input);
    if (!is_new) return fmt::format("{} and {}", other->second, input);
  }
  return "";
}

}  // namespace orvalis::cli
