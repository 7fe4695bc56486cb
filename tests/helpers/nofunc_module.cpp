// A module without NumericArrayResize, to be named as the host run-time.
#include <cstdint>

extern "C" __attribute__((visibility("default"))) int32_t QdmTestNotAHostRuntime() { return 1; }
