// The formats in which audio is written, by the names that users give them.
#pragma once

#include <string>
#include <vector>

namespace orvalis::cli {

/// Names for --format.
std::vector<std::string> output_format_names();

/// The format that a file's name ends in, in the words of output_format_names; "" if in none.
std::string format_of_name(const std::string &file);

/// libsndfile's number for one of output_format_names.
int sndfile_format(const std::string &format);

}  // namespace orvalis::cli
