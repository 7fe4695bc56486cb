// A module without NumericArrayResize, to be named as the host run-time.
#include <cstdint>

#if defined(_WIN32)
extern "C" __declspec(dllexport) int32_t QdmTestNotAHostRuntime() { return 1; }
#else
extern "C" __attribute__((visibility("default"))) int32_t QdmTestNotAHostRuntime() { return 1; }
#endif
