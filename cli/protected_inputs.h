// The inputs, which no output may destroy under whatever name: a link, another case, standard
// output.
#pragma once

#include <string>
#include <vector>

namespace orvalis::cli {

/// Names the inputs of this run, before its work begins; "-" is standard input.
void protect_inputs(const std::vector<std::string> &names);

/// Whether an output of that name, or standard output for "-", is the file of an input.
bool is_protected(const std::string &name);

}  // namespace orvalis::cli
