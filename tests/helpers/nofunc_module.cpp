// A module that looks like a host run-time (it exports the probe symbol) but
// lacks NumericArrayResize.
#include <cstdint>

extern "C" __attribute__((visibility("default"))) const int32_t gGFRTVersion = 1;
