#pragma once

#include <cstdint>
#include <memory>

#include "Platform/CompletionSource.h"
#include "Platform/DeviceFiles.h"

/// What an overlapped record says of its request. `internal` is the word that starter, completion and asker
/// share: a marker while the request runs, its outcome afterwards.
namespace Varnholt::Platform::Drivers {

/// True while the request runs. The caller may do what it likes with the record, its event and the buffer as
/// soon as this answers false.
bool IsRunning(const Overlapped& record);

/// The outcome and bytes of a record that is not running.
ErrorCode OutcomeOf(const Overlapped& record, std::uint32_t& transferred);

/// Marks the record as running and resets its event, whose next signal comes from `source` (may be null).
void MarkRunning(Overlapped& record, const std::shared_ptr<CompletionSource>& source);

/// Stores how the request ended and signals the event. The record is not touched afterwards.
void MarkEnded(Overlapped& record, ErrorCode code, std::uint32_t transferred);

/// Marks the record of a request that was not started, a failure without a signal, and returns it as a start
/// does.
bool RefuseStart(Overlapped& record, ErrorCode code);

}  // namespace Varnholt::Platform::Drivers
