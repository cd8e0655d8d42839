#pragma once

#include <cstdint>
#include <memory>
#include <string>

namespace Varnholt::Service {

/// How far something has come; it has ended when the object is gone. Tells nobody, if nothing is overridden.
class Progress {
  public:
    virtual ~Progress() = default;
    virtual void Update(std::uint64_t /*done*/) {}
};

/// Who is told of work while it runs, on the thread that runs it. Nobody, if nothing is overridden.
class Observer {
  public:
    virtual ~Observer() = default;

    /// Something that the user would like to know.
    virtual void Note(const std::string& /*text*/) {}
    /// Everything is known to be right, and an instrument about to be opened.
    virtual void Opening() {}
    /// `total` 0: not known. `unit` is what is counted, "B" for bytes. Never null.
    virtual std::unique_ptr<Progress> StartProgress(const std::string& /*title*/, std::uint64_t /*total*/,
                                                    const std::string& /*unit*/) {
        return std::make_unique<Progress>();
    }
};

}  // namespace Varnholt::Service
