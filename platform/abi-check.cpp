// The box may be 32-bit ARM, where these are 4 bytes wide unless the build asks for 8.
#include <sys/types.h>

#include <ctime>

static_assert(sizeof(off_t) == 8, "build with _FILE_OFFSET_BITS=64");
static_assert(sizeof(ino_t) == 8, "build with _FILE_OFFSET_BITS=64");
static_assert(sizeof(time_t) == 8, "build with _TIME_BITS=64");
