#include "cli/epd_command.h"

#include <fmt/format.h>
#include <orvalis.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <filesystem>
#include <limits>
#include <memory>
#include <stdexcept>
#include <string>
#include <system_error>
#include <vector>

#include "cli/audio_options.h"
#include "cli/detection.h"
#include "cli/label_reports.h"
#include "cli/output_file.h"
#include "cli/progress.h"
#include "cli/report.h"
#include "cli/split_names.h"
#include "cli/turns.h"

namespace orvalis::cli {
namespace {

struct EpdOptions {
  std::vector<std::string> files;
  DetectionSettings detection;
  std::string gain = "1";
  std::string format = "table";
  std::string dump_folder;
  std::size_t jobs = 1;
  bool log = false;
};

/// Reports when it is a job's turn.
class ReportInTurn : public Report {
public:
  ReportInTurn(Report &report, Turn &turn) : report_(report), turn_(turn) {}

  void begin_file(const std::string &name, int rate_hz) override {
    turn_.act([name, rate_hz, &report = report_] { report.begin_file(name, rate_hz); });
  }
  void utterance(const Utterance &found) override {
    turn_.act([found, &report = report_] { report.utterance(found); });
  }
  void frame(std::int64_t number, int answer) override {
    turn_.act([number, answer, &report = report_] { report.frame(number, answer); });
  }
  void end_file(std::int64_t samples) override {
    turn_.act([samples, &report = report_] { report.end_file(samples); });
  }

private:
  Report &report_;
  Turn &turn_;
};

/// Ctrl-C ends whoever writes into the pipe as well: what was said last is then still reported, at
/// the end of the input. A second Ctrl-C ends the tool.
void outlive_one_interrupt() {
  std::signal(SIGINT, [](int) { std::signal(SIGINT, SIG_DFL); });
}

std::unique_ptr<Report> make_report(const EpdOptions &options) {
  const bool several = options.files.size() > 1;
  const std::string &format = options.format;
  if (format == "json") return make_json_report();
  if (format == "csv") return make_csv_report();
  if (options.detection.frames && format != "table")
    throw CLI::ValidationError("--frames", "the format " + format + " knows utterances only");
  if (format == "rttm") return make_rttm_report();
  if (several && format != "table")
    throw CLI::ValidationError("--format", format + " describes one file, but several are given");
  if (format == "labels") return make_labels_report();
  if (format == "textgrid") return make_textgrid_report();
  return make_table_report(several);
}

/// Folders are made before the work begins.
void make_folder(const char *option, const std::filesystem::path &folder) {
  std::error_code error;
  std::filesystem::create_directories(folder, error);
  if (!error && access(folder.c_str(), W_OK) != 0) error = {errno, std::generic_category()};
  if (error)
    throw std::runtime_error(fmt::format("{} {}: {}", option, folder.string(), error.message()));
}

void prepare_split(const EpdOptions &options) {
  if (const std::string pair = same_parts(options.files); !pair.empty())
    throw CLI::ValidationError("--split", pair + " would give files of the same names");
  make_folder("--split", options.detection.split_folder);
}

void prepare_dump(EpdOptions &options) {
  if (options.files.size() > 1)
    throw CLI::ValidationError("--dump", "several files are given, but only one can be dumped");
  if (SetDumpRoot(options.dump_folder.c_str()) != 0)
    throw CLI::ValidationError("--dump", "the folder's name is too long");
  make_folder("--dump", std::filesystem::path(options.dump_folder) / "sdcard/VRpreprocess");
  options.detection.detector.pcm_dump = 1;
}

int run_epd(EpdOptions &options) {
  const auto inputs = std::ranges::count(options.files, "-");
  if (inputs > 1) throw CLI::ValidationError("FILE", "standard input can be read only once");
  options.detection.detector.input_gain = options.gain == "0.25" ? 1 : options.gain == "4" ? 2 : 0;
  const std::unique_ptr<Report> report = make_report(options);
  if (!options.detection.split_folder.empty()) prepare_split(options);
  if (!options.dump_folder.empty()) prepare_dump(options);
  if (inputs == 1) outlive_one_interrupt();
  if (!options.log) SetLogSink([](int, const char *, const char *, void *) {}, nullptr);

  int status = 0;
  Progress progress;
  run_in_turn(options.files.size(), options.jobs, [&](std::size_t job, Turn &turn) {
    const std::string &name = options.files[job];
    ReportInTurn in_turn(*report, turn);
    const auto show = [&](const Advance &advance) {
      if (turn.has_come() && !options.log) progress.update(advance);
    };
    const auto fail = [&](const std::exception &error) {
      turn.act([&name, &status, message = std::runtime_error(error.what())] {
        print_input_error(name, message);
        status = 1;
      });
    };
    try {
      detect(name, options.detection, in_turn, show);
    } catch (const AudioError &error) {
      fail(error);
    } catch (const OutputError &error) {
      fail(error);
    }
  });
  return status;
}

constexpr const char *kExamples = R"(Input:
  Any file that libsndfile reads (WAV, FLAC, Ogg, MP3, AIFF, AU, ...), at any rate.
  8 and 16 kHz audio of 16 bits is judged as it is. Other rates are resampled to
  16 kHz, other sample formats rounded to 16 bits; what exceeds full scale clips.
  Several channels are averaged unless --channel picks one.
  "-" reads standard input: WAV (or AIFF, AU, Ogg), or with --raw samples alone.
  Each utterance is printed the moment it is decided.

Files of utterances:
  --split clips writes take.wav's utterances to clips/take-001.wav, clips/take-002.wav
  and so on: the samples of the input with its rate, channels and sample format.
  Standard input gives what the engine heard, as clips/stdin-001.wav and so on.

Output:
  Times are seconds of the input. "start" and "end" are the borders of the
  utterance; "began" and "ended" tell when the detector gave its first and last
  answer "speech". "open" marks an utterance that the end of the audio has cut.
    table     to read
    json      one object a line; *_sample fields count samples at its "rate"
    csv       for a spreadsheet
    labels    a label track for Audacity (one file)
    textgrid  an interval tier for Praat (one file, written at its end)
    rttm      SPEAKER lines for diarisation tools

Exit status:
  0 all files done; 1 a file could not be read or split (the others are done); 2 wrong
  usage.

Examples:
  orvalis epd meeting.wav
  orvalis epd --format json --hangover 800 a.flac b.mp3
  orvalis epd --pad-before 200 --pad-after 300 --channel 2 call.wav
  orvalis epd --raw --rate 8000 line.raw
  orvalis epd --split clips --pad-before 100 --pad-after 100 meeting.wav
  orvalis epd --jobs 4 --format csv *.flac >all.csv
  orvalis epd --format labels take.wav >take.txt
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis epd --raw -)";

}  // namespace

void add_epd_command(CLI::App &app, int &exit_status) {
  const auto options = std::make_shared<EpdOptions>();
  UtteranceSettings &detector = options->detection.detector;
  const CLI::Validator milliseconds = from_to(0, 3600 * 1000);

  CLI::App *epd = app.add_subcommand("epd", "Find the utterances in audio files or live audio");
  epd->footer(kExamples);
  epd->add_option("FILE", options->files, "Audio files; \"-\" is standard input")
      ->required()
      ->type_name("");
  epd->add_option("--format", options->format, "table, json, csv, labels, textgrid or rttm")
      ->check(CLI::IsMember({"table", "json", "csv", "labels", "textgrid", "rttm"}).description(""))
      ->type_name("NAME")
      ->capture_default_str();

  auto *hangover = epd->add_option("--hangover", detector.hangover_ms,
                                   "Longest silence that joins what is before and after it");
  auto *before =
      epd->add_option("--pad-before", detector.pad_before_ms, "Time to add before an utterance");
  auto *after =
      epd->add_option("--pad-after", detector.pad_after_ms, "Time to add after an utterance");
  for (CLI::Option *option : {hangover, before, after})
    option->check(milliseconds)->type_name("MS")->capture_default_str();

  epd->add_option("--content-type", detector.content_type,
                  "Timing: 0 or 1; 2 and more are quicker\nand refuse short sounds")
      ->check(from_to(0, std::numeric_limits<int>::max()))
      ->type_name("N")
      ->capture_default_str();
  epd->add_option("--gain", options->gain, "Gain of the input: 0.25, 1 or 4 (wraps beyond 16 bits)")
      ->check(CLI::IsMember({"0.25", "1", "4"}).description(""))
      ->type_name("G")
      ->capture_default_str();
  const CLI::Validator not_empty(
      [](const std::string &text) { return std::string(text.empty() ? "the name is empty" : ""); },
      "");
  auto *split = epd->add_option("--split", options->detection.split_folder,
                                "Write each utterance to a WAV file of its\nown in this folder")
                    ->check(not_empty)
                    ->type_name("DIR");
  epd->add_flag("--force", options->detection.replace, "Replace files that are there already")
      ->needs(split);
  epd->add_flag("--frames", options->detection.frames,
                "Print the answer to every frame of 10 ms\ninstead of utterances")
      ->excludes(hangover)
      ->excludes(before)
      ->excludes(after)
      ->excludes(split);
  auto *jobs = epd->add_option("--jobs", options->jobs, "Files to work on at once")
                   ->check(from_to(1, 256))
                   ->type_name("N")
                   ->capture_default_str();
  epd->add_flag("--log", options->log, "Show the engine's log lines on standard error")
      ->excludes(jobs);
  epd->add_option("--dump", options->dump_folder,
                  "Let the engine write its dump files below\nthis folder (of one file)")
      ->check(not_empty)
      ->type_name("DIR");

  add_audio_options(*epd, options->detection.audio);
  epd->callback([options, &exit_status] { exit_status = run_epd(*options); });
}

}  // namespace orvalis::cli
