// `orvalis denoise`, `orvalis level` and `orvalis process`: better audio from audio.
#include <unistd.h>

#include <filesystem>
#include <limits>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "cli/commands.h"
#include "cli/enhance.h"
#include "cli/jobs.h"
#include "cli/options.h"
#include "cli/output_plan.h"

namespace orvalis::cli {
namespace {

struct EnhanceOptions {
  std::vector<std::string> inputs;  ///< And, until the command runs, the output
  EnhanceSettings settings;
  std::string output;  ///< By -o, or ""
  std::string format;
  std::string report = "table";
  std::size_t jobs = 1;
  bool mix = false;
  bool replace = false;
  bool sync = false;
  bool not_aligned = false;
};

/// The settings that several options decide together.
EnhanceSettings settings_of(const EnhanceOptions &options, ProtectedFiles &inputs) {
  EnhanceSettings settings = options.settings;
  const bool pair = settings.enhancement.microphones == 2;
  settings.audio.wide_only = true;
  settings.audio.channels = pair          ? Channels::kPair
                            : options.mix ? Channels::kMean
                                          : Channels::kRefuse;
  settings.audio.channel_hint =
      settings.enhancement.suppression_db > 0
          ? "average them with --mix, or pick one with --channel N, or clean two microphones with "
            "--mics 2"
          : "average them with --mix, or pick one with --channel N";
  settings.enhancement.aligned = options.not_aligned ? 0 : 1;
  settings.rules = {options.replace, options.sync, &inputs};
  settings.detector.split.rules = settings.rules;
  return settings;
}

int run_enhancement(EnhanceOptions &options, Console &console) {
  std::vector<std::string> &inputs = options.inputs;
  std::string destination = options.output;
  if (destination.empty()) {
    if (inputs.size() < 2) throw CLI::RequiredError("OUTPUT");
    destination = std::move(inputs.back());
    inputs.pop_back();
  }
  if (destination == "/dev/stdout") destination = "-";  // keeps the report out of the audio
  check_inputs(inputs);
  const auto report = make_report(options.report, "--report", inputs.size(), console);
  OutputPlan plan =
      plan_outputs(inputs, destination, options.format, options.settings.detector.split.folder);
  std::vector<OutputTarget> &targets = plan.targets;
  ProtectedFiles protected_files(inputs);
  const EnhanceSettings settings = settings_of(options, protected_files);
  prepare_split(settings.detector.split, inputs);
  if (!plan.folder.empty()) make_folder("OUTPUT", plan.folder);
  if (!is_streamed(targets.front().name))
    remove_leftovers(std::filesystem::path(targets.front().name).parent_path());
  if (destination == "-") {
    if (isatty(STDOUT_FILENO) != 0)
      throw CLI::ValidationError("OUTPUT",
                                 "audio does not go to a terminal; give a file, or a pipe behind");
    if (protected_files.role_of("-") != nullptr)
      throw std::runtime_error("standard output: the file is an input");
    targets.front().standard_output = console.reserve_standard_output();
  }
  return process_files(inputs, options.jobs, console, [&](Job &job) {
    ReportInTurn in_turn(*report, job);
    enhance(job, targets[job.number()], settings, in_turn);
  });
}

constexpr const char *kInputAndOutput = R"(
Output:
  One channel of 16 bits at 16 kHz, or with --keep-rate at the rate of the input, as
  long as the input and not delayed. Its name gives the format: .wav, .flac, .ogg,
  .opus, .aiff, .au, .caf or .raw. A file appears under its name when it is complete.
  It never replaces an input, and other files only with --force. In a folder, each
  output gets the name of its input. "-" writes standard output while input still
  arrives, as WAV of open length or raw.

Input, times and exit status: orvalis help input
)";

constexpr const char *kDenoiseNotes = R"(
Examples:
  orvalis denoise meeting.wav clean.wav
  orvalis denoise --level 18 --keep-rate call.flac clean.flac
  orvalis denoise --mics 2 headset.wav clean.wav
  orvalis denoise --jobs 4 *.wav cleaned/
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis denoise --raw - - | aplay -q)";

constexpr const char *kLevelNotes = R"(
On standard error it reports for how long the audio was loud, how many samples of the
input are clipped, and how many of the output are at full scale.

Examples:
  orvalis level meeting.wav level.wav
  orvalis level --channel 2 call.wav level.flac)";

constexpr const char *kProcessNotes = R"(
The utterances are those of the processed audio, reported on standard output, or on
standard error if the audio goes to standard output. --split writes them as processed,
at 16 kHz.

Examples:
  orvalis process meeting.wav out.wav
  orvalis process --report json --split clips meeting.wav out.flac
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis process --raw - out.wav)";

struct CommandTexts {
  const char *name;
  const char *summary;
  const char *notes;
};

void add_suppression_options(CLI::App &command, EnhancementSettings &enhancement) {
  command
      .add_option("--level", enhancement.suppression_db,
                  "Suppression of one microphone in dB: 13 or 18")
      ->check(one_of({"13", "18"}))
      ->type_name("DB")
      ->capture_default_str();
  command
      .add_option(
          "--mics", enhancement.microphones,
          "Microphones: 1, or 2, which are the two channels\nof the input; the first one is "
          "cleaned")
      ->check(from_to(1, 2))
      ->type_name("N")
      ->capture_default_str();
}

void add_headroom_option(CLI::App &command, double &headroom_db) {
  command
      .add_option("--headroom", headroom_db,
                  "Make the input that much quieter first, so that\nless of it clips")
      ->check(CLI::Range(0.0, 60.0).description(""))
      ->type_name("DB")
      ->capture_default_str();
}

/// Adds a command with the options that all of them have.
CLI::App *add_command(CLI::App &app, const CommandTexts &texts,
                      const std::shared_ptr<EnhanceOptions> &options, Run &run) {
  CLI::App *command = app.add_subcommand(texts.name, texts.summary);
  command->footer(std::string(kInputAndOutput).substr(1) + texts.notes);
  EnhanceSettings &settings = options->settings;
  command->add_option("FILE", options->inputs, "Audio files; \"-\" is standard input")
      ->required()
      ->option_text("REQUIRED")
      ->expected(1, std::numeric_limits<int>::max())
      ->type_name("");
  // FILE takes all names, and the last one is moved.
  command
      ->add_option("OUTPUT",
                   "A file, a folder (which is created if necessary),\n"
                   "or \"-\" for standard output; or see -o")
      ->option_text("REQUIRED");
  command->add_option("-o,--output", options->output, "OUTPUT, given here instead of last")
      ->check(not_empty())
      ->type_name("OUTPUT");
  command->add_option("-f,--format", options->format, "Format of the output (default: by its name)")
      ->check(one_of(output_format_names()))
      ->type_name("NAME");
  command->add_flag("--force", options->replace, "Replace existing files");
  command->add_flag("--sync", options->sync, "Have files on the disk before they get their names");
  command->add_flag("--keep-rate", settings.keep_rate, "Convert back to the rate of the input");
  add_jobs_option(*command, options->jobs);
  add_quiet_option(*command, run.console);
  CLI::Option *channel =
      add_audio_options(*command, settings.audio, "Channel to process, from 1, of several");
  command->add_flag("--mix", options->mix, "Process the mean of several channels")
      ->excludes(channel);
  if (settings.enhancement.level == 1) add_headroom_option(*command, settings.headroom_db);
  if (settings.enhancement.suppression_db > 0)
    add_suppression_options(*command, settings.enhancement);
  command->callback([options, command, &run] {
    if (options->settings.enhancement.microphones == 2)
      for (const char *of_one : {"--level", "--channel", "--mix"})
        if (command->count(of_one) > 0) throw CLI::ExcludesError("--mics 2", of_one);
    run.exit_status = run_enhancement(*options, run.console);
  });
  return command;
}

}  // namespace

void add_enhance_commands(CLI::App &app, Run &run) {
  const auto denoise = std::make_shared<EnhanceOptions>();
  add_command(app, {"denoise", "Suppress the noise in speech", kDenoiseNotes}, denoise, run)
      ->add_flag("--no-align", denoise->not_aligned,
                 "Keep the suppressor's delay: 48 samples, or 160\nwith two microphones");

  const auto level = std::make_shared<EnhanceOptions>();
  level->settings.enhancement.suppression_db = 0;
  level->settings.enhancement.level = 1;
  add_command(app, {"level", "Even out how loud speech is: dynamics control", kLevelNotes}, level,
              run);

  const auto process = std::make_shared<EnhanceOptions>();
  process->settings.enhancement.level = 1;
  process->settings.detect = true;
  CLI::App *command = add_command(
      app, {"process", "Denoise, level, and find the utterances of the result", kProcessNotes},
      process, run);
  add_report_option(*command, "--report", process->report);
  add_utterance_options(*command, process->settings.detector);
}

}  // namespace orvalis::cli
