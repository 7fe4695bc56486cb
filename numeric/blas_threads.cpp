// The library's BLAS runs single-threaded, and that setting is the library's
// own.
//
// The host calls the library from many threads at once, each call a few small
// or tall-and-thin factorizations; BLAS threads on top of the host's would
// multiply with them and make every call several times slower. The Linux
// library carries a private copy of OpenBLAS (the pthreads variant, linked with
// all of its symbols local: see QDM_BLAS in CMakeLists.txt), so setting that
// copy to one thread touches nothing else in the process: numpy, or the host,
// keeps its own OpenBLAS and its own thread count, and whatever it sets never
// reaches this library. At one thread the copy does exactly the calling
// thread's work; its buffer pool is handed out under a lock, which is what
// makes the pthreads variant safe for concurrent callers.
//
// The copy's own constructor starts a pool of worker threads (one fewer than
// the processors, or than OPENBLAS_NUM_THREADS asks). The order of
// constructors within one shared library is not fixed, so this one runs the
// copy's initialisation itself first (it runs once and is then a no-op), sets
// one thread and shuts the idle pool down again. Nothing restarts it: only a
// call that runs on more than one thread hands work to the pool.
//
// On the reference BLAS (QDM_BLAS=reference) and in the Windows DLL there is
// nothing to set: both are single-threaded.
#if defined(QDM_PRIVATE_OPENBLAS)

extern "C" {
void gotoblas_init(void);
void openblas_set_num_threads(int threads);
int openblas_get_num_threads(void);
int blas_thread_shutdown_(void);
}

namespace {

bool UseOneBlasThread() {
  gotoblas_init();
  openblas_set_num_threads(1);
  blas_thread_shutdown_();
  return openblas_get_num_threads() == 1;
}

const bool g_one_blas_thread = UseOneBlasThread();

}  // namespace

#endif
