#include "meter/support/run.h"

u8 absCounts = 0;
u8 cacheEnabled = 0;
f32 cacheElapsedTime = -1.0F;
u32 NUM_PCPUS = 0;
