#include "Utilities/Files/ByteSource.h"

namespace Varnholt::Utilities::Files {

std::vector<std::uint8_t> ReadUpTo(ByteSource& source, std::size_t limit,
                                   const std::function<void()>& await) {
    std::vector<std::uint8_t> content(limit + 1);
    for (std::size_t size = 0; size < content.size();) {
        if (await) {
            await();
        }
        const std::size_t count = source.Read(content.data() + size, content.size() - size);
        size += count;
        if (count == 0) {
            content.resize(size);
        }
    }
    return content;
}

}  // namespace Varnholt::Utilities::Files
