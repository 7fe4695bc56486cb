# The private OpenBLAS stays private: libqdm_api exports only qdm_* names, and
# neither library asks the process for a BLAS, LAPACK or OpenBLAS symbol (its
# calls all bind to its own copy). libqdm's exact export list has its own
# test (e2e.HostBinding).
if(NOT QDM_PRIVATE_OPENBLAS OR NOT TARGET qdm_api)
  return()
endif()
find_program(QDM_NM nm)
if(NOT QDM_NM)
  return()
endif()
add_test(NAME linkage.private_blas
         COMMAND sh -c [=[
set -e
nm=$1; host=$2; api=$3
bad=$("$nm" -D --defined-only "$api" | awk '{print $NF}' | grep -v '^qdm_' || true)
[ -z "$bad" ] || { echo "libqdm_api exports: $bad"; exit 1; }
[ "$("$nm" -D --defined-only "$api" | wc -l)" -gt 0 ] || { echo "no exports read"; exit 1; }
for lib in "$host" "$api"; do
  bad=$("$nm" -D --undefined-only "$lib" | awk '{print $NF}' |
        grep -E -i '(blas|lapack|goto|^[cdsz][a-z0-9]+_$)' || true)
  [ -z "$bad" ] || { echo "$lib needs: $bad"; exit 1; }
done
echo "private BLAS: no BLAS/LAPACK/OpenBLAS name exported or needed"
]=] linkage ${QDM_NM} $<TARGET_FILE:qdm> $<TARGET_FILE:qdm_api>)
