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
  qdm_complex x[4096];
  int32_t n = 0;
  while (n < 4096 && fscanf(f, "%lf,%lf", &x[n][0], &x[n][1]) == 2) ++n;
  fclose(f);

  const int32_t p = atoi(argv[2]);
  qdm_complex* a = malloc(sizeof(qdm_complex) * (size_t)(p + 1)); /* p + 1 coefficients */
  qdm_complex* poles = malloc(sizeof(qdm_complex) * (size_t)p);   /* p poles */
  double variance = 0.0;
  /* C before C23 wants the cast to add const to a pointer to arrays. */
  const int32_t status = qdm_covariance_complex((const qdm_complex*)x, n, p, a, poles, &variance);
  if (status < 0) {
    fprintf(stderr, "qdm_covariance_complex: %d: %s\n", status, qdm_status_text(status));
    return 2;
  }
  printf("noise_variance %.17g\n", variance);
  for (int32_t k = 0; k <= p; ++k) printf("a[%d] %.17g %.17g\n", k, a[k][0], a[k][1]);
  free(a);
  free(poles);
  return 0;
}
