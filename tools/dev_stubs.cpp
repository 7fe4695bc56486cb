#pragma GCC diagnostic ignored "-Wunused-parameter"
// Weak placeholders so that the library links while its pieces are written.
// Every real definition overrides its placeholder; the file goes once all exist.
#include "numeric/numeric.h"
#include "fft/fft.h"
#include "estimation/estimation.h"

__attribute__((weak)) StatusCode MatMulReal(const double* A, const double* B, int32_t m, int32_t k, int32_t n, double* C) { return -20999; }
__attribute__((weak)) StatusCode MatMulComplex(const Complex* A, const Complex* B, int32_t m, int32_t k, int32_t n, Complex* C) { return -20999; }
__attribute__((weak)) StatusCode DotReal(const double* x, const double* y, int32_t n, double* result) { return -20999; }
__attribute__((weak)) StatusCode VecSubReal(const double* a, const double* b, int32_t n, double* out) { return -20999; }
__attribute__((weak)) StatusCode VecCopyReal(const double* src, int32_t n, double* dst) { return -20999; }
__attribute__((weak)) StatusCode VecZeroReal(double* x, int32_t n) { return -20999; }
__attribute__((weak)) StatusCode VecNegateReal(double* x, int32_t n, double* out) { return -20999; }
__attribute__((weak)) int32_t HasNonFiniteReal(const double* x, int64_t n) { return 0; }
__attribute__((weak)) int32_t HasNonFiniteComplex(const Complex* x, int64_t n) { return 0; }
__attribute__((weak)) StatusCode TransposeReal(double* A, int32_t m, int32_t n, double* out) { return -20999; }
__attribute__((weak)) StatusCode ConjTransposeComplex(Complex* A, int32_t m, int32_t n, Complex* out) { return -20999; }
__attribute__((weak)) StatusCode SvdReal(const double* A, int32_t m, int32_t n, double* U, double* S, double* V, int32_t full) { return -20999; }
__attribute__((weak)) StatusCode SvdComplex(const Complex* A, int32_t m, int32_t n, Complex* U, double* S, Complex* V, int32_t full) { return -20999; }
__attribute__((weak)) StatusCode LeastSquaresReal(const double* A, int32_t m, int32_t n, const double* B, int32_t nrhs, double* X, double rcond) { return -20999; }
__attribute__((weak)) StatusCode LeastSquaresPinvReal(const double* A, int32_t m, int32_t n, const double* B, int32_t nrhs, double* X, double rcond) { return -20999; }
__attribute__((weak)) StatusCode LeastSquaresComplex(const Complex* A, int32_t m, int32_t n, const Complex* B, int32_t nrhs, Complex* X, double rcond) { return -20999; }
__attribute__((weak)) StatusCode PseudoInverseReal(double* A, int32_t m, int32_t n, double tol, double* out) { return -20999; }
__attribute__((weak)) StatusCode PseudoInverseComplex(Complex* A, int32_t m, int32_t n, double tol, Complex* out) { return -20999; }
__attribute__((weak)) StatusCode EigGeneralReal(const double* A, int32_t n, int32_t wantVectors, Complex* eigenvalues, Complex* vectors) { return -20999; }
__attribute__((weak)) StatusCode EigGeneralComplex(Complex* A, int32_t n, int32_t wantVectors, Complex* eigenvalues, Complex* vectors) { return -20999; }
__attribute__((weak)) StatusCode EigSymReal(double* A, int32_t n, int32_t wantVectors, double* eigenvalues, double* vectors) { return -20999; }
__attribute__((weak)) StatusCode EigHermitianComplex(const Complex* A, int32_t n, int32_t wantVectors, double* eigenvalues, Complex* vectors) { return -20999; }
__attribute__((weak)) StatusCode EigComplex(Complex* A, int32_t n, int32_t hermitian, int32_t wantVectors, Complex* eigenvalues, Complex* vectors) { return -20999; }
__attribute__((weak)) StatusCode SortReal(double* x, int32_t n, int32_t descending, double* out) { return -20999; }
__attribute__((weak)) StatusCode MinMaxReal(const double* x, int32_t n, double* maxValue, int32_t* maxIndex, double* minValue, int32_t* minIndex) { return -20999; }
__attribute__((weak)) StatusCode ComplexToPolar(double re, double im, double* magnitude, double* angle) { return -20999; }
__attribute__((weak)) StatusCode ComplexDivide(double a, double b, double c, double d, double* re, double* im) { return -20999; }
__attribute__((weak)) StatusCode ComplexSqrt(double re, double im, double* outRe, double* outIm) { return -20999; }
__attribute__((weak)) StatusCode PolyRootsComplex(const Complex* c, int32_t n, int32_t maxIterations, Complex* roots) { return -20999; }
__attribute__((weak)) FftPlan* FftPlanAcquire(int32_t n) { return nullptr; }
__attribute__((weak)) void FftPlanRelease(FftPlan* plan) {  }
__attribute__((weak)) StatusCode FftComplex(const FftPlan* plan, const double* inRe, const double* inIm, double* outRe, double* outIm, int32_t inStride, int32_t outStride, int32_t n) { return -20999; }
__attribute__((weak)) StatusCode FftReal(const FftPlan* plan, const double* in, double* out, int32_t inStride, int32_t outStride, int32_t n) { return -20999; }
__attribute__((weak)) StatusCode PowerSpectrumReal(double* x, int32_t n) { return -20999; }
__attribute__((weak)) StatusCode ApplyWindow(double* x, int32_t n, int32_t kind, int32_t flag) { return -20999; }
__attribute__((weak)) StatusCode BuildForwardMatrixReal(const double* x, int32_t n, int32_t p, double* b, double* A) { return -20999; }
__attribute__((weak)) StatusCode BuildForwardMatrixComplex(const Complex* x, int32_t n, int32_t p, Complex* b, Complex* A) { return -20999; }
__attribute__((weak)) StatusCode BuildBackwardMatrixReal(const double* x, int32_t n, int32_t p, double* b, double* A) { return -20999; }
__attribute__((weak)) StatusCode BuildBackwardMatrixComplex(const Complex* x, int32_t n, int32_t p, Complex* b, Complex* A) { return -20999; }
__attribute__((weak)) StatusCode ReverseReal(const double* src, double* dst, int32_t count) { return -20999; }
__attribute__((weak)) StatusCode ReverseComplex(const Complex* src, Complex* dst, int32_t count) { return -20999; }
__attribute__((weak)) StatusCode VecSubComplex(const Complex* u, const Complex* v, int32_t count, Complex* out) { return -20999; }
__attribute__((weak)) StatusCode CovarianceArReal(const double* x, int32_t n, int32_t p, double* a, Complex* r, double* variance) { return -20999; }
__attribute__((weak)) StatusCode CovarianceArComplex(const Complex* x, int32_t n, int32_t p, Complex* a, Complex* r, double* variance) { return -20999; }
__attribute__((weak)) StatusCode ModeAmplitudesComplex(const Complex* x, int32_t n, const Complex* z, int32_t k, Complex* A, double* E) { return -20999; }
__attribute__((weak)) StatusCode ModeAmplitudesReal(const double* x, int32_t n, const Complex* z, int32_t k, Complex* A, double* E) { return -20999; }
__attribute__((weak)) StatusCode ModeParameters(const Complex* A, int32_t kA, const Complex* z, int32_t kz, double fs, int32_t realFlag, double* amp, double* phase, double* damp, double* freq, int32_t* count) { return -20999; }
__attribute__((weak)) StatusCode PronyComplex(const Complex* x, int32_t n, int32_t p, double fs, double* amp, double* phase, double* damp, double* freq, int32_t* count) { return -20999; }
__attribute__((weak)) StatusCode PronyReal(const double* x, int32_t n, int32_t p, double fs, int32_t realFlag, double* amp, double* phase, double* damp, double* freq, int32_t* count) { return -20999; }
__attribute__((weak)) StatusCode PcarEstimateReal(const double* x, int32_t n, int32_t p, int32_t k, double* a, Complex* roots) { return -20999; }
__attribute__((weak)) StatusCode PcarEstimateComplex(const Complex* x, int32_t n, int32_t p, int32_t k, Complex* a, Complex* roots) { return -20999; }
__attribute__((weak)) StatusCode PcarThresholdReal(const double* A, int32_t rows, int32_t cols, int32_t k, double* tau) { return -20999; }
__attribute__((weak)) StatusCode PcarThresholdComplex(const Complex* A, int32_t rows, int32_t cols, int32_t k, double* tau) { return -20999; }
__attribute__((weak)) StatusCode PencilMatrixReal(const double* x, int32_t n, int32_t L, int32_t M, double* K) { return -20999; }
__attribute__((weak)) StatusCode PencilMatrixComplex(const Complex* x, int32_t n, int32_t L, int32_t M, Complex* K) { return -20999; }
__attribute__((weak)) StatusCode ScaleRowsByInverseReal(double* A, int32_t rows, int32_t cols, const double* s) { return -20999; }
__attribute__((weak)) StatusCode ScaleRowsByInverseComplex(Complex* A, int32_t rows, int32_t cols, const double* s) { return -20999; }
__attribute__((weak)) StatusCode MatrixPencilReal(const double* x, int32_t n, int32_t L, int32_t M, double fs, int32_t realFlag, double* amp, double* phase, double* damp, double* freq, double* mse, int32_t* count) { return -20999; }
__attribute__((weak)) StatusCode MatrixPencilComplex(const Complex* x, int32_t n, int32_t L, int32_t M, double fs, double* amp, double* phase, double* damp, double* freq, double* mse, int32_t* count) { return -20999; }
__attribute__((weak)) StatusCode MdlOrderReal(const double* x, int32_t n, int32_t L, int32_t minOrder, int32_t* order) { return -20999; }
__attribute__((weak)) StatusCode MdlOrderComplex(const Complex* x, int32_t n, int32_t L, int32_t minOrder, int32_t* order) { return -20999; }
__attribute__((weak)) int32_t IntLog2(int32_t x) { return 0; }
__attribute__((weak)) int32_t SpectrumLength(int32_t m) { return 0; }
__attribute__((weak)) StatusCode CovPowerSpectrumComplex(const Complex* x, int32_t n, int32_t p, int32_t N, double fs, SpectrumResult* result, double* variance) { return -20999; }
__attribute__((weak)) StatusCode CovPowerSpectrumReal(const double* x, int32_t n, int32_t p, int32_t N, double fs, SpectrumResult* result, double* variance) { return -20999; }
__attribute__((weak)) StatusCode PcarPowerSpectrumComplex(const Complex* x, int32_t n, int32_t p, int32_t k, int32_t N, double fs, double* amp, double* phase, double* freq, double* fitError, SpectrumResult* result, int32_t* count) { return -20999; }
__attribute__((weak)) StatusCode PcarPowerSpectrumReal(const double* x, int32_t n, int32_t p, int32_t k, int32_t N, double fs, int32_t realFlag, double* amp, double* phase, double* freq, double* fitError, SpectrumResult* result, int32_t* count) { return -20999; }
__attribute__((weak)) StatusCode ArSpectrumComplex(Complex* a, int32_t m, int32_t recip, double fs, int32_t N, int32_t mode, SpectrumResult* result) { return -20999; }
__attribute__((weak)) StatusCode ArSpectrumReal(double* a, int32_t m, int32_t recip, double fs, int32_t N, int32_t mode, SpectrumResult* result) { return -20999; }
__attribute__((weak)) StatusCode SelectRootsNearUnitCircle(const Complex* z, int32_t p, int32_t k, Complex* out) { return -20999; }
__attribute__((weak)) StatusCode RotateReal(double* x, int32_t L, int32_t s) { return -20999; }
__attribute__((weak)) StatusCode NormalizeByPeak(double* in, int32_t L, double* out, double* peak) { return -20999; }
