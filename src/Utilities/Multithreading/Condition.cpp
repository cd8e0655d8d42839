#include "Utilities/Multithreading/Condition.h"

namespace Varnholt::Utilities::Multithreading {

Condition::Condition(Mutex& mutex) : impl_(CreateConditionImpl(mutex)) {}

}  // namespace Varnholt::Utilities::Multithreading
