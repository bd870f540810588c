// Every service for AVX2.
#define ORVALIS_BODY  avx2
#define ORVALIS_LANES "Voice_Engine/basic_op/lanes_x86.h"
#include "Voice_Engine/bodies/services_body.h"
