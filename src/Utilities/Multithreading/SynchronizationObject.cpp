#include "Utilities/Multithreading/SynchronizationObject.h"

namespace Varnholt::Utilities::Multithreading {

SynchronizationObject::SynchronizationObject(std::unique_ptr<Impl> owned) : impl_(owned.release()) {}

}  // namespace Varnholt::Utilities::Multithreading
