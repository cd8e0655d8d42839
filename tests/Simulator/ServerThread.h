#pragma once

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <functional>
#include <future>
#include <memory>
#include <string>
#include <thread>
#include <utility>

#include "PollLoop.h"
#include "UsbIpServer.h"

namespace Varnholt::Simulator {

/// A server with its loop on a thread of its own, as if it were another program.
class ServerThread final {
  public:
    ServerThread() : server_(std::make_unique<UsbIpServer>(loop_, Log())) {
        if (pipe2(tasks_.data(), O_CLOEXEC) != 0) {
            std::abort();
        }
        loop_.Watch(tasks_[0], POLLIN, [this] {
            Task* task = nullptr;
            if (read(tasks_[0], &task, sizeof task) == sizeof task) {
                Task own = std::move(*task);  // whoever waits for its end destroys the other
                own();
            }
        });
        thread_ = std::thread([this] { loop_.Run(); });
    }
    ~ServerThread() {
        Do([this] {
            server_.reset();
            loop_.Stop();
        });
        thread_.join();
        close(tasks_[0]);
        close(tasks_[1]);
    }

    /// A name that no other test has.
    static std::string UniqueName(const std::string& stem) {
        static int number = 0;
        return "test-" + std::to_string(getpid()) + "-" + std::to_string(++number) + "-" + stem;
    }

    std::shared_ptr<SimulatedInstrument> Add(const std::string& name, const InstrumentSettings& settings = {},
                                             const std::string& faults = "") {
        auto instrument = std::make_shared<SimulatedInstrument>(loop_, settings);
        Do([&] { server_->Add({name, instrument, FaultPlan::Parse(faults), {}}); });
        return instrument;
    }

    /// Calls `function` on the server's thread and waits for its end; passes on what it throws.
    void Do(std::function<void()> function) {
        Task task(std::move(function));
        Task* const pointer = &task;
        auto done = task.get_future();
        if (write(tasks_[1], &pointer, sizeof pointer) == sizeof pointer) {
            done.get();
        }
    }
    /// Lets the server's time jump.
    void Advance(std::uint64_t microseconds) {
        Do([&] { loop_.ahead += microseconds; });
    }
    UsbIpServer& Server() { return *server_; }

  private:
    using Task = std::packaged_task<void()>;
    struct AdvancedLoop final : PollLoop {
        std::uint64_t Now() override { return PollLoop::Now() + ahead; }
        std::uint64_t ahead = 0;
    };

    std::array<int, 2> tasks_{-1, -1};  ///< a pipe with pointers to tasks
    AdvancedLoop loop_;
    std::unique_ptr<UsbIpServer> server_;
    std::thread thread_;
};

}  // namespace Varnholt::Simulator
