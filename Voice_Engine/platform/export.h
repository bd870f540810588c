// Marks what is visible outside the library, if the linker's export list holds it too.
#pragma once

#define ORVALIS_EXPORT __attribute__((visibility("default")))
