#include "Voice_Engine/basic_op/flags.h"

orvalis::Word32 Overflow = 0, Carry = 0;
orvalis::Word32 ns_Overflow = 0, ns_Carry = 0;
orvalis::Word16 Overflow_ZOLT = 0, Carry_ZOLT = 0;
