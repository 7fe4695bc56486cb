/* Covariance-method AR fit of a complex record through the plain C API.
 * Build: cc plain_covariance.c $(pkg-config --cflags --libs qdm)
 * Run:   ./a.out tests/data/marple64.csv 15 */
#include <stdio.h>
#include <stdlib.h>

#include <qdm_api.h>

int main(int argc, char** argv) {
  if (argc < 3) {
    fprintf(stderr, "usage: %s FILE.csv ORDER\n", argv[0]);
    return 1;
  }
  FILE* f = fopen(argv[1], "r");
  if (f == NULL) {
    perror(argv[1]);
    return 1;
  }
  /* One "re,im" line per sample, as many as the file holds. */
  qdm_complex* x = NULL;
  size_t n = 0, room = 0;
  double re, im;
  while (fscanf(f, "%lf,%lf", &re, &im) == 2) {
    if (n == room) {
      room = room ? 2 * room : 1024;
      qdm_complex* grown = realloc(x, sizeof(qdm_complex) * room);
      if (grown == NULL || room > (size_t)INT32_MAX) {
        free(grown == NULL ? x : grown);
        fprintf(stderr, "%s: too many samples\n", argv[1]);
        return 1;
      }
      x = grown;
    }
    x[n][0] = re;
    x[n][1] = im;
    ++n;
  }
  if (!feof(f)) fprintf(stderr, "%s: stopped at line %zu, not a \"re,im\" pair\n", argv[1], n + 1);
  fclose(f);

  const int32_t p = atoi(argv[2]);
  qdm_complex* a = malloc(sizeof(qdm_complex) * (size_t)(p > 0 ? p + 1 : 1)); /* p + 1 values */
  qdm_complex* poles = malloc(sizeof(qdm_complex) * (size_t)(p > 0 ? p : 1)); /* p poles */
  double variance = 0.0;
  /* C before C23 wants the cast to add const to a pointer to arrays. */
  const int32_t status =
      qdm_covariance_complex((const qdm_complex*)x, (int32_t)n, p, a, poles, &variance);
  if (status < 0) {
    fprintf(stderr, "qdm_covariance_complex: %d: %s\n", status, qdm_status_text(status));
    return 2;
  }
  printf("noise_variance %.17g\n", variance);
  for (int32_t k = 0; k <= p; ++k) printf("a[%d] %.17g %.17g\n", k, a[k][0], a[k][1]);
  free(x);
  free(a);
  free(poles);
  return 0;
}
