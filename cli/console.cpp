#include "cli/console.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <orvalis.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string_view>
#include <system_error>

namespace orvalis::cli {
namespace {

constexpr std::chrono::seconds kFirstProgress{1};
constexpr std::chrono::milliseconds kProgressInterval{200};

bool on_terminal() {
  const char *kind = std::getenv("TERM");
  return isatty(STDERR_FILENO) != 0 && (kind == nullptr || std::string_view(kind) != "dumb");
}

/// The last column stays free: a line that wraps cannot be cleared.
std::size_t columns() {
  winsize size{};
  if (ioctl(STDERR_FILENO, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return 79;
  return size.ws_col - std::size_t{1};
}

std::string clock_time(double seconds) {
  const auto whole = static_cast<long long>(seconds);
  return fmt::format("{}:{:02}:{:02}", whole / 3600, whole / 60 % 60, whole % 60);
}

std::string display_name(const std::string &input) {
  return input == "-" ? "standard input" : input;
}

/// The progress line, cut to the terminal's width.
std::string text_of(const Progress &progress) {
  std::string text;
  if (progress.length_s.value_or(0) > 0) {
    const double share = std::min(progress.processed_s / *progress.length_s, 1.0);
    text += fmt::format("{:3.0f} %  ", 100 * share);
  }
  text += fmt::format("{}  {:.1f} x real time  ", clock_time(progress.processed_s),
                      progress.processed_s / std::max(progress.elapsed_s, 0.001));
  text += printable(std::filesystem::path(display_name(progress.name)).filename());
  if (const std::size_t room = columns(); text.size() > room) {
    // A UTF-8 character takes at least as many bytes as columns, and must not be cut in half.
    std::size_t length = room;
    while (length > 0 && (static_cast<unsigned char>(text[length]) & 0xC0) == 0x80) --length;
    text.resize(length);
  }
  return text;
}

}  // namespace

std::string printable(const std::string &text) {
  std::string result;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const auto c = static_cast<unsigned char>(text[i]);
    const auto next = static_cast<unsigned char>(i + 1 < text.size() ? text[i + 1] : 0);
    if (c < 0x20 || c == 0x7f) {
      result += fmt::format("\\x{:02x}", c);
    } else if (c == 0xC2 && next >= 0x80 && next < 0xA0) {  // U+0080 to U+009F in UTF-8
      result += fmt::format("\\x{:02x}", next);
      ++i;
    } else {
      result += text[i];
    }
  }
  return result;
}

Console::Console() : shows_progress_(on_terminal()), next_progress_(Clock::now() + kFirstProgress) {
  SetLogSink(LogNothing, nullptr);
}

Console::~Console() { clear_progress(); }

void Console::print_line(const std::string &line) {
  clear_progress();
  if (std::fputs((line + "\n").c_str(), stdout) == EOF || std::fflush(stdout) == EOF)
    throw std::system_error(errno, std::generic_category(), "standard output");
}

void Console::print_error(const std::string &message) {
  clear_progress();
  std::fputs(("orvalis: " + printable(message) + "\n").c_str(), stderr);
}

void Console::print_error(const std::string &input, const std::string &text) {
  print_error(display_name(input) + ": " + text);
}

void Console::print_note(const std::string &input, const std::string &text) {
  if (shows_notes_) print_error(input, text);
}

void Console::show_progress(const Progress &progress) {
  if (!shows_progress_ || Clock::now() < next_progress_) return;
  next_progress_ = Clock::now() + kProgressInterval;
  std::fputs(("\r\x1b[K" + text_of(progress)).c_str(), stderr);
  progress_is_shown_ = true;
}

void Console::clear_progress() {
  if (progress_is_shown_) std::fputs("\r\x1b[K", stderr);
  progress_is_shown_ = false;
}

void Console::be_quiet() { shows_notes_ = shows_progress_ = false; }

void Console::show_engine_log() {
  SetLogSink(LogAllToStandardError, nullptr);
  shows_progress_ = false;
}

int Console::reserve_standard_output() {
  const int reserved = fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
  if (reserved < 0 || dup2(STDERR_FILENO, STDOUT_FILENO) < 0)
    throw std::system_error(errno, std::generic_category(), "standard output");
  return reserved;
}

}  // namespace orvalis::cli
