#pragma once

#include <cstdint>
#include <memory>
#include <new>
#include <string>

#include "Platform/Linux/Clock.h"
#include "Platform/Linux/SharedFile.h"

/// What the files of named objects are made of.
namespace Varnholt::Platform::Linux {

/// Lets the threads of all processes wait until an object may have become available. A process may die at any
/// point of it: then a wake-up is tried for nobody, or a sleeper wakes a little later.
class ChangeCount final {
  public:
    std::uint32_t Get() const;
    void Increment();
    /// Returns soon after the count has passed `seen`, and after `limit` at the latest.
    void Await(std::uint32_t seen, Microseconds limit);

  private:
    // Only through `std::atomic_ref`.
    mutable std::uint32_t changes_ = 0;
    std::uint32_t sleepers_ = 0;
};

/// What the content of every file derives from; tells our memory from other content, and from that of a
/// process with another layout of it.
template <typename Content>
struct Header {
    static constexpr std::uint64_t Magic = 0x4F53545241000000u + Content::Version;
    std::uint64_t magic = Magic;
    std::uint64_t size = sizeof(Content);
    ChangeCount changes;
    bool IsValid() const { return magic == Magic && size == sizeof(Content); }
};

template <typename Content>
std::unique_ptr<SharedFile> OpenContent(const std::string& kind, const std::string& name,
                                        const Content& initial) {
    return SharedFile::Open(
        kind, name,
        {.size = sizeof(Content),
         .initialise = [&initial](void* memory) { return (new (memory) Content(initial))->Initialise(); },
         .isValid = [](const void* memory) { return static_cast<const Content*>(memory)->IsValid(); }});
}

template <typename Content>
Content& ContentIn(const SharedFile& file) {
    return *static_cast<Content*>(file.Memory());
}

}  // namespace Varnholt::Platform::Linux
