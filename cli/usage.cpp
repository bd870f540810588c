#include "cli/usage.h"

#include <fmt/format.h>

#include <algorithm>
#include <memory>
#include <numeric>
#include <string_view>
#include <vector>

namespace orvalis::cli {
namespace {

constexpr const char *kInputTopic = R"(Input of all commands:
  Any file that libsndfile reads (WAV, FLAC, Ogg, MP3, AIFF, AU, ...), at any rate.
  Audio of 16 bits at 16 kHz is processed as it is, and except by denoise, level and
  process also at 8 kHz. Other rates are resampled to 16 kHz, other sample formats
  rounded to 16 bits; what exceeds full scale clips.
  Several channels are averaged unless --channel picks one; denoise, level and process
  refuse them unless --channel, --mix or --mics 2 says which is meant.
  "-" reads standard input: WAV (or AIFF, AU, Ogg), or with --raw samples alone.
  Three or more samples at full scale, in a row or with single others in between, count
  as clipped, which is reported.

Times:
  200ms, 0.2s or 200, which is in milliseconds.

Exit status:
  0 all files were processed; 1 a file could not be read, written or split (the others
  were processed); 2 wrong usage.)";

/// Without what CLI11 adds about options that exclude or need each other: a message says so when it
/// matters.
class HelpFormatter : public CLI::Formatter {
public:
  /// Shows OUTPUT in the usage line without the brackets of what may be left out.
  std::string make_option_usage(const CLI::Option *option) const override {
    const std::string name = option->get_name();
    return name == "OUTPUT" ? name : CLI::Formatter::make_option_usage(option);
  }

  std::string make_option_opts(const CLI::Option *option) const override {
    const std::string text = CLI::Formatter::make_option_opts(option);
    return text.substr(0, std::min(text.find(" Needs:"), text.find(" Excludes:")));
  }
};

/// How many letters have to be typed, dropped, replaced or swapped with the next to make `b` of
/// `a`.
std::size_t distance(std::string_view a, std::string_view b) {
  std::vector<std::size_t> before, above, row(b.size() + 1);
  std::iota(row.begin(), row.end(), 0);
  for (std::size_t i = 1; i <= a.size(); ++i) {
    before = std::move(above);
    above = row;
    row[0] = i;
    for (std::size_t j = 1; j <= b.size(); ++j) {
      row[j] = std::min({above[j] + 1, row[j - 1] + 1, above[j - 1] + (a[i - 1] != b[j - 1])});
      if (i > 1 && j > 1 && a[i - 1] == b[j - 2] && a[i - 2] == b[j - 1])
        row[j] = std::min(row[j], before[j - 2] + 1);
    }
  }
  return row[b.size()];
}

/// "; did you mean ...?", or nothing if no name is near.
std::string suggestion(const std::string &word, const std::vector<std::string> &names) {
  std::string nearest;
  std::size_t min = 3;  // No typing error changes more than two letters.
  for (const std::string &name : names)
    if (const std::size_t d = distance(word, name); d < min && d < word.size() / 2 + 1) {
      min = d;
      nearest = name;
    }
  return nearest.empty() ? "" : fmt::format("; did you mean \"{}\"?", nearest);
}

std::vector<std::string> command_names(const CLI::App &app) {
  std::vector<std::string> names;
  for (const CLI::App *command : app.get_subcommands([](const CLI::App *) { return true; }))
    names.push_back(command->get_name());
  return names;
}

std::vector<std::string> option_names(const CLI::App &app) {
  std::vector<std::string> names;
  for (const CLI::Option *option : app.get_options())
    for (const std::string &name : option->get_lnames()) names.push_back("--" + name);
  return names;
}

std::string unknown_command(const CLI::App &app, const std::string &word) {
  return fmt::format("unknown command \"{}\"{}", word, suggestion(word, command_names(app)));
}

std::string unexpected(const CLI::App &command, const std::string &word) {
  if (word.size() > 1 && word[0] == '-')
    return fmt::format("unknown option \"{}\"{}", word,
                       suggestion(word.substr(0, word.find('=')), option_names(command)));
  return command.get_parent() == nullptr ? unknown_command(command, word)
                                         : fmt::format("unexpected argument \"{}\"", word);
}

}  // namespace

void set_help_format(CLI::App &app) { app.formatter(std::make_shared<HelpFormatter>()); }

void add_help_command(CLI::App &app, Run &run) {
  const auto topic = std::make_shared<std::string>();
  CLI::App *help = app.add_subcommand("help", "Show the help of a command, or of all their input");
  help->add_option("COMMAND", *topic, "A command, or \"input\"")->type_name("");
  help->callback([topic, &app, &run] {
    if (*topic == "input") return run.console.print_line(kInputTopic);
    const auto names = command_names(app);
    if (!topic->empty() && std::ranges::count(names, *topic) == 0)
      throw CLI::ParseError(unknown_command(app, *topic), 1);
    const CLI::App *shown = topic->empty() ? &app : app.get_subcommand(*topic);
    // As --help prints it; app.help() would show the command that was parsed.
    const std::string name = app.get_name() + (topic->empty() ? "" : " " + *topic);
    std::string text = app.get_formatter()->make_help(shown, name, CLI::AppFormatMode::Normal);
    text.pop_back();
    run.console.print_line(text);
  });
}

std::string usage_error(const CLI::App &app, const CLI::Error &error) {
  const auto parsed = app.get_subcommands();
  const CLI::App &command = parsed.empty() ? app : *parsed.front();
  std::string text = error.what();
  // A misspelt option comes before what may be missing because of it.
  const auto words = command.remaining();
  const auto option = std::ranges::find_if(
      words, [](const std::string &word) { return word.size() > 1 && word[0] == '-'; });
  if (!words.empty()) {
    text = unexpected(command, option != words.end() ? *option : words.front());
  } else if (dynamic_cast<const CLI::RequiredError *>(&error) != nullptr && &command == &app) {
    text = "a command is missing";
  }
  const std::string help =
      parsed.empty() ? app.get_name() : app.get_name() + " " + command.get_name();
  return fmt::format("orvalis: {}\nRun {} --help for more.\n", printable(text), help);
}

}  // namespace orvalis::cli
