// Marks what callers outside the library may see; the linker's export list has the last word.
#pragma once

#define ORVALIS_EXPORT __attribute__((visibility("default")))
