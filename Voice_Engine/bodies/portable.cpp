// Every service in plain C++.
#define ORVALIS_BODY  portable
#define ORVALIS_LANES "Voice_Engine/basic_op/lanes_portable.h"
#include "Voice_Engine/bodies/services_body.h"
