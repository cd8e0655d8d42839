#include "Support/ResourceCount.h"

#include <chrono>
#include <ostream>
#include <thread>

namespace Varnholt::TestSupport {

ResourceCount ResourceCount::TakeSettled() {
    ResourceCount count = Take();
    for (int same = 0, i = 0; same < 10 && i < 300; ++i) {
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
        const ResourceCount now = Take();
        same = now == count ? same + 1 : 0;
        count = now;
    }
    return count;
}

bool ResourceCount::Settles() const {
    for (int i = 0; i < 300; ++i) {
        if (Take() == *this) {
            return true;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    return false;
}

std::ostream& operator<<(std::ostream& stream, const ResourceCount& count) {
    return stream << count.threads << " threads, " << count.files << " files, " << count.maps << " maps";
}

}  // namespace Varnholt::TestSupport
