// LAPACK and CBLAS report an illegal argument through error handlers that, in
// the reference build, print a line and stop the process. Inside the host
// process that would end the host, so the Windows build, which links the
// reference archives statically, defines both handlers itself: these
// definitions come before the archives on the link line and replace theirs.
// LAPACK then returns with INFO = -(argument position), which the numeric layer
// turns into a status; the CBLAS routines return without computing, and the
// numeric layer checks their sizes before calling them.
//
// The Linux build calls the system's shared LAPACK. There a replacement would
// only take effect if libqdm exported it, adding to the export table and
// taking over the handler of every other LAPACK user in the host process, so
// it is not built there.
#if defined(_WIN32)

#include "numeric/lapack_api.h"

extern "C" {

void LAPACK_GLOBAL(xerbla, XERBLA)(const char* /*routine*/, const lapack_int* /*position*/,
                                   size_t /*routine_length*/) {}

void cblas_xerbla(CBLAS_INT /*position*/, const char* /*routine*/, const char* /*form*/, ...) {}

}  // extern "C"

#endif
