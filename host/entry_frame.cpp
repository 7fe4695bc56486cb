#include "host/entry_frame.h"

#include <cstring>

#include "host/binding.h"
#include "numeric/work.h"

namespace host {

int32_t BlockCount(QdmArrayHandle handle) {
  int32_t count;
  std::memcpy(&count, *handle, sizeof count);
  return count;
}

void SetBlockCount(QdmArrayHandle handle, int32_t count) {
  // NOLINTNEXTLINE(clang-analyzer-core.NullDereference): only on handles a resize left
  std::memcpy(*handle, &count, sizeof count);
}

void* BlockElements(QdmArrayHandle handle) {
  return reinterpret_cast<unsigned char*>(*handle) + sizeof(int32_t);
}

namespace {

size_t ElementBytes(int32_t typeCode) { return DoublesPerElement(typeCode) * sizeof(double); }

// Steps 4 and 5: aligned copies, the estimator, results into the host blocks.
// `handles` are the output handles as the resizes left them.
StatusCode EstimateAndCopyOut(const EntryPlan& entry, const QdmArrayHandle* handles,
                              EstimatorCall estimate) {
  const size_t n = entry.n < 0 ? 0 : static_cast<size_t>(entry.n);
  WorkArray<double> input = AllocWork<double>(n * DoublesPerElement(entry.inputType));
  WorkArray<double> outputs[kMaxOutputs];
  bool have_all = static_cast<bool>(input);
  for (size_t i = 0; i < entry.outputs.size(); ++i) {
    const OutputArray& out = entry.outputs[i];
    outputs[i] =
        AllocWork<double>(static_cast<size_t>(out.length) * DoublesPerElement(out.typeCode));
    have_all = have_all && outputs[i];
  }
  if (!have_all) return status::kNoMemory;

  std::memcpy(input.get(), BlockElements(entry.input), n * ElementBytes(entry.inputType));
  EntryCall call{};
  call.input = input.get();
  call.n = entry.n;
  for (size_t i = 0; i < entry.outputs.size(); ++i) call.outputs[i] = outputs[i].get();
  for (size_t j = 0; j < entry.outDoubles.size(); ++j) {
    if (entry.outDoubles[j].role == OutDoubleRole::kPassThrough) {
      std::memcpy(&call.outDoubles[j], entry.outDoubles[j].host, sizeof(double));
    }
  }

  const StatusCode s = estimate.invoke(estimate.estimator, call);

  for (size_t j = 0; j < entry.outDoubles.size(); ++j) {
    if (entry.outDoubles[j].role == OutDoubleRole::kPassThrough) {
      std::memcpy(entry.outDoubles[j].host, &call.outDoubles[j], sizeof(double));
    }
  }
  if (s != status::kOk) return s;

  for (size_t i = 0; i < entry.outputs.size(); ++i) {
    const OutputArray& out = entry.outputs[i];
    std::memcpy(BlockElements(handles[i]), outputs[i].get(),
                static_cast<size_t>(out.length) * ElementBytes(out.typeCode));
    if (out.count == CountSource::kModes) SetBlockCount(handles[i], call.modes);
  }
  for (size_t j = 0; j < entry.outDoubles.size(); ++j) {
    double value = call.outDoubles[j];
    switch (entry.outDoubles[j].role) {
      case OutDoubleRole::kEstimator:
        break;
      case OutDoubleRole::kSpectrumF0:
        value = call.spectrum.f0;
        break;
      case OutDoubleRole::kSpectrumDf:
        value = call.spectrum.df;
        break;
      case OutDoubleRole::kPassThrough:
        continue;
    }
    std::memcpy(entry.outDoubles[j].host, &value, sizeof value);
  }
  return status::kOk;
}

}  // namespace

int32_t RunEntry(const EntryPlan& entry, EstimatorCall estimate) {
  // A resize may replace a null handle, as the host function does with any
  // handle passed by address; later steps use what it left.
  QdmArrayHandle handles[kMaxOutputs] = {};
  for (size_t i = 0; i < entry.outputs.size(); ++i) handles[i] = entry.outputs[i].handle;

  StatusCode s = entry.check;
  for (size_t i = 0; s == status::kOk && i < entry.outputs.size(); ++i) {
    const OutputArray& out = entry.outputs[i];
    // The host's own error code is carried as a status and mapped as one.
    s = StatusCode{
        NumericArrayResize(out.typeCode, 1, &handles[i], static_cast<size_t>(out.length))};
    if (s != status::kOk && entry.onResizeFailure == ResizeFailure::kReturnAtOnce) {
      return MapStatus(s);
    }
  }
  if (s == status::kOk) {
    for (size_t i = 0; i < entry.outputs.size(); ++i) {
      if (entry.outputs[i].count == CountSource::kLength) {
        SetBlockCount(handles[i], entry.outputs[i].length);
      }
    }
    s = EstimateAndCopyOut(entry, handles, estimate);
    if (s == status::kOk) return 0;
  }

  for (size_t i = 0; i < entry.outputs.size(); ++i) {
    (void)NumericArrayResize(entry.outputs[i].typeCode, 1, &handles[i], 0);
    SetBlockCount(handles[i], 0);
  }
  for (const OutDouble& out : entry.outDoubles) {
    if (out.role == OutDoubleRole::kPassThrough) continue;
    const double zero = 0.0;
    std::memcpy(out.host, &zero, sizeof zero);
  }
  return MapStatus(s);
}

int32_t RunMdlEntry(QdmArrayHandle data, int32_t inputType, int32_t n, StatusCode check, int32_t L,
                    int32_t minOrder, int32_t* order, MdlEstimator estimate) {
  if (check != status::kOk) return MapStatus(check);
  const size_t count = static_cast<size_t>(n);
  WorkArray<double> input = AllocWork<double>(count * DoublesPerElement(inputType));
  StatusCode s = status::kNoMemory;
  int32_t chosen = 0;
  if (input) {
    std::memcpy(input.get(), BlockElements(data), count * ElementBytes(inputType));
    std::memcpy(&chosen, order, sizeof chosen);
    s = estimate(input.get(), n, L, minOrder, &chosen);
  }
  if (s != status::kOk) chosen = 0;
  std::memcpy(order, &chosen, sizeof chosen);
  return MapStatus(s);
}

}  // namespace host
