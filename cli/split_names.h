// Names for the parts of inputs: take.wav gives take-001.wav, take-002.wav ...
#pragma once

#include <string>
#include <vector>

namespace orvalis::cli {

/// The name of part `number`, counted from 1, of an input, in `folder`.
std::string part_name(const std::string &folder, const std::string &input, int number);

/// Two of the inputs whose parts would have the same names, as "a and b"; empty if there are none.
std::string same_parts(const std::vector<std::string> &inputs);

}  // namespace orvalis::cli
