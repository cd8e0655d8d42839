#include "Utilities/Multithreading/Condition.h"

namespace Varnholt::Utilities::Multithreading {

Condition::Condition(Mutex& mutex) : impl(CreateConditionImpl(mutex)) {}

}  // namespace Varnholt::Utilities::Multithreading
