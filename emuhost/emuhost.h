/* Emulated Graffel host run-time, for tests, the example host and bindings.
 *
 * A small shared library (libgfrtemu.so / gfrtemu.dll) that exports the
 * host's NumericArrayResize and the probe symbol gGFRTVersion, and owns array
 * blocks laid out exactly as the host lays them out: a 32-bit count at byte 0
 * and the elements from byte 4, so that element pointers are 4 modulo 8. */
#ifndef QDM_EMUHOST_H
#define QDM_EMUHOST_H

#include <stddef.h>
#include <stdint.h>

#include "qdm.h"

#if defined(_WIN32)
#if defined(EMUHOST_BUILDING)
#define EMUHOST_API __declspec(dllexport)
#else
#define EMUHOST_API __declspec(dllimport)
#endif
#else
#define EMUHOST_API __attribute__((visibility("default")))
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* The host function the library resolves at run time. Resizes the block of
 * *handle (allocating handle and block when *handle is null) to hold `count`
 * elements of the type code (10 or 13); does not change the stored count.
 * Returns 0 or a host error number. */
EMUHOST_API int32_t NumericArrayResize(int32_t typeCode, int32_t numDims, QdmArrayHandle* handle,
                                       size_t count);

/* New handle of `count` elements of the type code, count field set, elements
 * copied from `values` (count doubles for type 10, 2*count for type 13; null
 * gives zeros). Not a NumericArrayResize call: neither counted nor logged,
 * and it never takes an injected failure. */
EMUHOST_API QdmArrayHandle EmuMakeHandle(int32_t typeCode, int32_t count, const double* values);
EMUHOST_API void EmuFreeHandle(QdmArrayHandle handle);
/* The count field of the block. */
EMUHOST_API int32_t EmuCount(QdmArrayHandle handle);
/* Capacity in elements of the block (what the last resize asked for). */
EMUHOST_API size_t EmuCapacity(QdmArrayHandle handle);
/* Address of the first element (block + 4): 4 modulo 8. */
EMUHOST_API void* EmuElements(QdmArrayHandle handle);
/* Copies `doubles` doubles out of the elements into out (memcpy: the elements
 * are not 8-aligned). */
EMUHOST_API void EmuRead(QdmArrayHandle handle, double* out, size_t doubles);

/* The next NumericArrayResize call (after `skip` further ones that succeed)
 * returns `error` instead of resizing; error 0 clears. */
EMUHOST_API void EmuFailResize(int32_t skip, int32_t error);
/* As EmuFailResize, but every call from that one on fails until cleared. */
EMUHOST_API void EmuFailResizesFrom(int32_t skip, int32_t error);
/* Number of NumericArrayResize calls so far, and the arguments of the last one. */
EMUHOST_API int64_t EmuResizeCalls(void);
EMUHOST_API void EmuLastResize(int32_t* typeCode, int32_t* numDims, size_t* count);
/* Arguments of resize call number `call` (1-based, as counted by
 * EmuResizeCalls); the most recent 1024 calls are kept. Returns 0 if that call
 * is no longer (or not yet) in the log. */
EMUHOST_API int32_t EmuResizeAt(int64_t call, int32_t* typeCode, int32_t* numDims, size_t* count);

#ifdef __cplusplus
}
#endif

#endif /* QDM_EMUHOST_H */
