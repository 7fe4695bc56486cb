#include "core/call_record.h"

namespace call_record {
namespace {

struct Record {
  bool active = false;
  StatusCode worst = status::kOk;
};
thread_local Record t_record;

}  // namespace

void Begin() { t_record = Record{true, status::kOk}; }

StatusCode End() {
  const StatusCode worst = t_record.worst;
  t_record = Record{};
  return worst;
}

void Note(StatusCode s) {
  if (!t_record.active || s == status::kOk) return;
  t_record.worst = MergeStatus(t_record.worst, s);
}

}  // namespace call_record
