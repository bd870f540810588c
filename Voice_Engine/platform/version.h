// The version of the library, as log lines and callers see it.
#pragma once

namespace orvalis {

inline constexpr char kVersion[] = "160705";

}  // namespace orvalis
