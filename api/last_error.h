// The calling thread's record of its last plain-API call: the status, and for
// an argument error the argument, its value and the limit it broke, as
// qdm_last_error_message() formats them. Every function of the face that
// returns a status starts with Begin() and returns through End().
#pragma once

#include <cstdint>

#include "estimation/entry_checks.h"

namespace last_error {

// Forgets the thread's last call; returns the record the new call's argument
// checks fill.
checks::Failure* Begin();

// The call's status, recorded and handed back.
int32_t End(int32_t status);

// This face's own refusals: each records why and returns `status`.
int32_t Refuse(int32_t status, const char* argument, double value, const char* relation,
               const char* limit = nullptr);
int32_t RefuseAgainst(int32_t status, const char* argument, double value, const char* relation,
                      const char* name, double limit);
int32_t Null(const char* argument);
int32_t NotFinite(const char* argument, double value);
// The first NaN or infinity among `values` doubles of the array `argument`
// (pairs when complex), which the caller knows to hold one.
int32_t NotFiniteSample(const double* x, int64_t values, bool complex, const char* argument = "x");
int32_t WorkLimit(double bytes, int32_t n);
// Ends the call with `status` and a message written out whole.
int32_t Text(int32_t status, const char* text);

}  // namespace last_error
