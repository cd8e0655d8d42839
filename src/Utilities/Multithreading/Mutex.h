#pragma once

#include <string>

#include "Utilities/Multithreading/SynchronizationObject.h"

namespace Varnholt::Utilities::Multithreading {

/// The recursive lock of `CreateMutexImpl`.
class Mutex final : public SynchronizationObject {
  public:
    explicit Mutex(const std::string& name) : SynchronizationObject(CreateMutexImpl(name)) {}
};

}  // namespace Varnholt::Utilities::Multithreading
