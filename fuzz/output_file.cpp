// The tool's writing: any names, links, formats and sizes, in a temporary folder.
#include "cli/output_file.h"

#include <stdlib.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "cli/output_plan.h"
#include "fuzz/input.h"

namespace {

namespace fs = std::filesystem;
using orvalis::fuzz::require;

/// Few names, so that they meet; now and then any bytes.
std::string name_of(orvalis::fuzz::Input &input) {
  static const char *const kNames[] = {"a.wav",   "b.flac", "a-001.wav", "c",          "c/a.wav",
                                       "./a.wav", "d/",     "link",      "link/a.wav", "b.raw"};
  const std::uint8_t choice = input.byte();
  if (choice < 250) return kNames[choice % std::size(kNames)];
  std::string name = "x";
  for (int left = input.byte(); left > 0; --left) {
    const char c = static_cast<char>(input.byte());
    name += c == '\0' || c == '/' ? '_' : c;
  }
  return name;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  orvalis::fuzz::Input input(bytes, size);
  const fs::path before = fs::current_path();
  std::string folder = fs::temp_directory_path() / "orvalis-fuzz-XXXXXX";
  require(mkdtemp(folder.data()) != nullptr && chdir(folder.c_str()) == 0, "a folder is made");
  fs::create_directory("c");
  fs::create_symlink("c", "link");
  std::ofstream("a.wav") << "an input";
  if (input.byte() % 2 == 0) fs::create_hard_link("a.wav", "c/a.wav");
  std::vector<std::string> inputs;
  for (int count = 1 + input.byte() % 3; count > 0; --count) inputs.push_back(name_of(input));
  orvalis::cli::ProtectedFiles files({"a.wav"});
  try {
    const std::string destination = name_of(input), split = input.byte() % 2 == 0 ? "c" : "";
    const auto plan = orvalis::cli::plan_outputs(inputs, destination, "", split);
    require(plan.targets.size() == inputs.size(), "each input has an output");
    for (const auto &target : plan.targets) {
      const std::uint8_t rules = input.byte();
      try {
        orvalis::cli::OutputFile file(target.name, {16000, 1 + rules / 4 % 2, input.number()},
                                      {rules % 2 == 0, false, &files});
        file.write(std::span<const short>(input.audio()));
        if (rules % 4 < 2) file.commit();
      } catch (const orvalis::cli::AudioError &) {
        // The tool tells the user and goes on.
      }
    }
  } catch (const CLI::ValidationError &) {
    // Wrong usage.
  }
  std::string text;
  std::getline(std::ifstream("a.wav"), text);
  require(text == "an input", "no input is overwritten");
  for (const auto &entry : fs::recursive_directory_iterator("."))
    require(entry.path().extension() != ".part", "nothing unfinished is left");
  fs::current_path(before);
  fs::remove_all(folder);
  return 0;
}
