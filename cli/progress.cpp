#include "cli/progress.h"

#include <fmt/format.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string_view>

namespace orvalis::cli {
namespace {

constexpr std::chrono::seconds kPatience{1};
constexpr std::chrono::milliseconds kInterval{200};

bool line_is_there = false;

bool on_terminal() {
  const char *kind = std::getenv("TERM");
  return isatty(STDERR_FILENO) != 0 && (kind == nullptr || std::string_view(kind) != "dumb");
}

/// Where the cursor may stand without leaving the line, which could not be wiped then.
std::size_t columns() {
  winsize size{};
  if (ioctl(STDERR_FILENO, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return 79;
  return size.ws_col - std::size_t{1};
}

std::string clock_time(double seconds) {
  const auto whole = static_cast<long long>(seconds);
  return fmt::format("{}:{:02}:{:02}", whole / 3600, whole / 60 % 60, whole % 60);
}

/// The line, cut to the terminal and free of what would move the cursor.
std::string text_of(const Advance &now) {
  std::string text;
  if (now.length_s.value_or(0) > 0) {
    const double share = std::min(now.heard_s / *now.length_s, 1.0);
    text += fmt::format("{:3.0f} %  ", 100 * share);
  }
  text += fmt::format("{}  {:.1f} x real time  ", clock_time(now.heard_s),
                      now.heard_s / std::max(now.elapsed_s, 0.001));
  text += now.name == "-" ? "standard input" : std::filesystem::path(now.name).filename().string();
  std::ranges::replace_if(
      text, [](unsigned char c) { return c < 0x20 || c == 0x7f; }, '?');
  if (const std::size_t room = columns(); text.size() > room) {
    // No character is wider than its bytes are many; half a character is none.
    std::size_t length = room;
    while (length > 0 && (static_cast<unsigned char>(text[length]) & 0xC0) == 0x80) --length;
    text.resize(length);
  }
  return text;
}

}  // namespace

Progress::Progress() : shown_(on_terminal()), next_(Clock::now() + kPatience) {}

Progress::~Progress() { wipe_progress(); }

void Progress::update(const Advance &advance) {
  if (!shown_ || Clock::now() < next_) return;
  next_ = Clock::now() + kInterval;
  std::fputs(("\r\x1b[K" + text_of(advance)).c_str(), stderr);
  line_is_there = true;
}

void wipe_progress() {
  if (line_is_there) std::fputs("\r\x1b[K", stderr);
  line_is_there = false;
}

}  // namespace orvalis::cli
