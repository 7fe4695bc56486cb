// The built-in example signal, shared by the example host and the qdm tool:
// three damped sinusoids at 120, 210 and 340 Hz in white noise, 128 samples
// at 1000 Hz. It is made with plain arithmetic from a fixed seed, and every
// program that includes this header is compiled with -ffp-contract=off, so it
// is the same bit for bit on every machine.
#ifndef QDM_EXAMPLE_SIGNAL_H
#define QDM_EXAMPLE_SIGNAL_H

#include <cstdint>
#include <vector>

namespace qdm_example {

constexpr int32_t kLength = 128;
constexpr double kRate = 1000.0;
constexpr double kNoise = 0.05;
constexpr uint64_t kSeed = 20240601;

// splitmix64: a small generator whose output is fixed by its definition.
struct SplitMix64 {
  uint64_t state;
  uint64_t Next() {
    uint64_t z = (state += 0x9e3779b97f4a7c15ull);
    z = (z ^ (z >> 30)) * 0xbf58476d1ce4e5b9ull;
    z = (z ^ (z >> 27)) * 0x94d049bb133111ebull;
    return z ^ (z >> 31);
  }
  double Uniform() { return static_cast<double>(Next() >> 11) * 0x1.0p-53; }
  // Approximately standard normal: the sum of twelve uniforms less six (mean
  // 0, variance 1), arithmetic only.
  double Normal() {
    double sum = 0.0;
    for (int i = 0; i < 12; ++i) sum += Uniform();
    return sum - 6.0;
  }
};

// Each mode is A z^t with the complex amplitude A = a e^{i phase} and the pole
// z = e^{-damping + 2 pi i f / fs}, written out as literals so that no libm
// call enters the signal.
struct Mode {
  double ampRe, ampIm, poleRe, poleIm;
  double frequency, damping, amplitude, phase;
};
constexpr Mode kModes[] = {
    {0.955336489125606, 0.29552020666133955, 0.7217152683869278, 0.6777357484181723, 120.0, 0.010,
     1.0, 0.3},
    {0.3175172849979041, 0.6238451520430047, 0.24376549746379728, 0.9494039295255473, 210.0, 0.020,
     0.7, 1.1},
    {0.3510330247561491, -0.1917702154416812, -0.5331543476899203, 0.8401168224053746, 340.0, 0.005,
     0.4, -0.5},
};

// The real example (the real parts: six poles), kLength values, or the complex
// one (three damped complex exponentials), kLength (re, im) pairs.
inline std::vector<double> Make(bool complexExample) {
  std::vector<double> values;
  SplitMix64 rng{kSeed};
  double re[3], im[3];
  for (int k = 0; k < 3; ++k) {
    re[k] = kModes[k].ampRe;
    im[k] = kModes[k].ampIm;
  }
  for (int32_t t = 0; t < kLength; ++t) {
    double sumRe = 0.0, sumIm = 0.0;
    for (int k = 0; k < 3; ++k) {
      sumRe += re[k];
      sumIm += im[k];
      const Mode& m = kModes[k];
      const double nr = re[k] * m.poleRe - im[k] * m.poleIm;
      const double ni = re[k] * m.poleIm + im[k] * m.poleRe;
      re[k] = nr;
      im[k] = ni;
    }
    if (complexExample) {
      // Circular noise of the same total power as the real example's.
      values.push_back(sumRe + kNoise * rng.Normal() * 0.7071067811865476);
      values.push_back(sumIm + kNoise * rng.Normal() * 0.7071067811865476);
    } else {
      values.push_back(sumRe + kNoise * rng.Normal());
    }
  }
  return values;
}

}  // namespace qdm_example

#endif  // QDM_EXAMPLE_SIGNAL_H
