// OpenBLAS runs single-threaded under this library.
//
// The host calls the library from many threads at once, each call a few small
// or tall-and-thin factorizations. Of Debian's OpenBLAS variants only the
// pthreads one is safe for concurrent callers (the serial one shares its
// buffers between threads without a lock, and concurrent calls then give wrong
// results); but its own threads multiply with the host's and make every call
// several times slower. Run with one thread, it does exactly the work of the
// calling thread, as fast as the serial variant, and safely. The setting is
// OpenBLAS's own, process-wide: it is made once, when the library is loaded.
// Other BLAS libraries lack the function, and the weak reference stays null.
#if !defined(_WIN32)

extern "C" void openblas_set_num_threads(int threads) __attribute__((weak));

namespace {

bool UseOneBlasThread() {
  if (openblas_set_num_threads != nullptr) openblas_set_num_threads(1);
  return true;
}

const bool g_one_blas_thread = UseOneBlasThread();

}  // namespace

#endif
