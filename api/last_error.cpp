#include "api/last_error.h"

#include <cmath>
#include <cstdio>
#include <cstring>

#include "qdm_api.h"

namespace last_error {
namespace {

struct LastCall {
  int32_t status = QDM_OK;
  checks::Failure failure;
  int64_t index = -1;  // the sample a non-finite refusal names, or -1
  char text[384];      // a message written out whole (a batch's), or empty
};

// One record per thread, constant-initialised (no guard, no destructor), so
// concurrent callers never see each other's messages.
thread_local LastCall last;

// A value as a reader types it: integers in full, other doubles in the
// fewest digits that give them back, with the library's own spellings of
// NaN and infinity.
void Number(char* out, size_t room, double v, bool brief) {
  if (std::isnan(v)) {
    std::snprintf(out, room, "nan");
  } else if (std::isinf(v)) {
    std::snprintf(out, room, v > 0 ? "inf" : "-inf");
  } else if (v == std::floor(v) && std::fabs(v) < 0x1p53) {
    std::snprintf(out, room, "%.0f", v);
  } else if (brief) {
    std::snprintf(out, room, "%.4g", v);
  } else {
    for (int digits = 15; digits <= 17; ++digits) {
      std::snprintf(out, room, "%.*g", digits, v);
      if (std::strtod(out, nullptr) == v) break;
    }
  }
}

// "<argument>[<index>] <value><unit> <relation> <limit>[ = <limit value>][ (n = <n>)]".
void Describe(const LastCall& c, char* out, size_t room) {
  const checks::Failure& f = c.failure;
  char value[40] = "", limit[40] = "", index[24] = "", n[32] = "";
  if (f.hasValue) {
    value[0] = ' ';
    Number(value + 1, sizeof value - 1, f.value, f.unit != nullptr);
  }
  if (f.limitNamed) {
    std::memcpy(limit, " = ", 4);
    Number(limit + 3, sizeof limit - 3, f.limitValue, false);
  }
  if (c.index >= 0) std::snprintf(index, sizeof index, "[%lld]", static_cast<long long>(c.index));
  if (f.n >= 0) std::snprintf(n, sizeof n, " (n = %d)", static_cast<int>(f.n));
  std::snprintf(out, room, "%s%s%s%s %s%s%s%s%s", f.argument, index, value,
                f.unit != nullptr ? f.unit : "", f.relation, f.limit != nullptr ? " " : "",
                f.limit != nullptr ? f.limit : "", limit, n);
}

checks::Failure& Slot() { return last.failure; }

}  // namespace

checks::Failure* Begin() {
  last = LastCall{};
  return &last.failure;
}

int32_t End(int32_t status) {
  last.status = status;
  return status;
}

int32_t Refuse(int32_t status, const char* argument, double value, const char* relation,
               const char* limit) {
  checks::Failure f;
  f.argument = argument;
  f.value = value;
  f.relation = relation;
  f.limit = limit;
  Slot() = f;
  return status;
}

int32_t RefuseAgainst(int32_t status, const char* argument, double value, const char* relation,
                      const char* name, double limit) {
  Refuse(status, argument, value, relation, name);
  Slot().limitNamed = true;
  Slot().limitValue = limit;
  return status;
}

int32_t Null(const char* argument) {
  Refuse(QDM_ERR_NULL_POINTER, argument, 0.0, "is null");
  Slot().hasValue = false;
  return QDM_ERR_NULL_POINTER;
}

int32_t NotFinite(const char* argument, double value) {
  return Refuse(QDM_ERR_NON_FINITE, argument, value, "is not finite");
}

int32_t NotFiniteSample(const double* x, int64_t values, bool complex, const char* argument) {
  int64_t i = 0;
  while (i < values && std::isfinite(x[i])) ++i;
  if (i == values) {
    Refuse(QDM_ERR_NON_FINITE, argument, 0.0, "holds a NaN or an infinity");
    Slot().hasValue = false;
    return QDM_ERR_NON_FINITE;
  }
  const bool imaginary = complex && i % 2 == 1;
  NotFinite(argument, x[i]);
  Slot().relation = imaginary ? "has an imaginary part that is not finite:" : "is not finite:";
  // The value follows the relation here: "x[17] is not finite: nan".
  Slot().limit = std::isnan(x[i]) ? "nan" : x[i] > 0 ? "inf" : "-inf";
  Slot().hasValue = false;
  last.index = complex ? i / 2 : i;
  return QDM_ERR_NON_FINITE;
}

int32_t Text(int32_t status, const char* text) {
  std::snprintf(last.text, sizeof last.text, "%s", text);
  return End(status);
}

int32_t WorkLimit(double bytes, int32_t n) {
  RefuseAgainst(QDM_ERR_WORK_LIMIT, "work memory", bytes, "is above", "QDM_MAX_WORK_BYTES",
                static_cast<double>(QDM_MAX_WORK_BYTES));
  Slot().unit = " bytes";
  Slot().n = n;
  return QDM_ERR_WORK_LIMIT;
}

}  // namespace last_error

extern "C" QDM_PLAIN_API int32_t qdm_last_error_message(char* buffer, int32_t size) {
  using last_error::last;
  char text[512] = "";
  if (last.text[0] != '\0') {
    std::snprintf(text, sizeof text, "%s", last.text);
  } else if (last.failure.argument != nullptr) {
    last_error::Describe(last, text, sizeof text);
  } else if (last.status != QDM_OK && last.status != QDM_WARN_RANK_DEFICIENT) {
    std::snprintf(text, sizeof text, "%s", qdm_status_text(last.status));
  }
  const int32_t length = static_cast<int32_t>(std::strlen(text));
  if (buffer != nullptr && size > 0) std::snprintf(buffer, static_cast<size_t>(size), "%s", text);
  return length;
}
