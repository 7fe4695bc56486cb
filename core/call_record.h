// A per-thread record of the failures that routines absorb during one call.
//
// Some estimators deliberately go on when a least-squares solve inside them
// fails (the host face's documented behaviour) and report success with whatever
// the solve left. A face that must never report success after an internal
// failure brackets its call with Begin/End: the allocation hook, the LAPACK
// boundary and the least-squares solves Note every non-zero status they
// produce, and End returns the worst one (an error over a warning, the first
// error kept). Outside a Begin/End bracket, Note costs one thread-local load.
//
// A thread-local record, rather than a status threaded through every routine,
// keeps the estimators' signatures and the host face's behaviour exactly as
// they are, and needs no lock: a call runs on one thread from entry to return.
#pragma once

#include "core/types.h"

namespace call_record {

void Begin();
// The worst status noted since Begin (0 if none); ends the recording.
StatusCode End();
void Note(StatusCode s);

}  // namespace call_record
