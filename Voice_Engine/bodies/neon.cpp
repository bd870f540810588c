// Every service for NEON.
#define ORVALIS_BODY  neon
#define ORVALIS_LANES "Voice_Engine/basic_op/lanes_neon.h"
#include "Voice_Engine/bodies/services_body.h"
