// Every service for SSE2, which x86-64 begins with.
#define ORVALIS_BODY  sse2
#define ORVALIS_LANES "Voice_Engine/basic_op/lanes_x86.h"
#include "Voice_Engine/bodies/services_body.h"
