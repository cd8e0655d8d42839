#pragma once

#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <functional>
#include <future>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "PollLoop.h"
#include "UsbIpServer.h"

namespace Varnholt::Simulator {

/// A server with its loop on a thread of its own, as if it were another program.
class ServerThread final {
  public:
    ServerThread() : wake_(eventfd(0, EFD_CLOEXEC)), server_(std::make_unique<UsbIpServer>(loop_, Log())) {
        loop_.Watch(wake_, POLLIN, [this] { DoTasks(); });
        thread_ = std::thread([this] { loop_.Run(); });
    }
    ~ServerThread() {
        Do([this] {
            server_.reset();
            loop_.Stop();
        });
        thread_.join();
        close(wake_);
    }
    ServerThread(const ServerThread&) = delete;
    ServerThread& operator=(const ServerThread&) = delete;

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

    /// Calls `task` on the server's thread and waits for its end; passes on what it throws.
    void Do(std::function<void()> task) {
        std::packaged_task<void()> packaged(std::move(task));
        auto done = packaged.get_future();
        {
            const std::lock_guard lock(mutex_);
            tasks_.push_back(std::move(packaged));
        }
        eventfd_write(wake_, 1);
        done.get();
    }
    /// Lets the server's time jump.
    void Advance(std::uint64_t microseconds) {
        Do([&] { loop_.ahead += microseconds; });
    }
    UsbIpServer& Server() { return *server_; }
    PollLoop& Loop() { return loop_; }

  private:
    struct AdvancedLoop final : PollLoop {
        std::uint64_t Now() override { return PollLoop::Now() + ahead; }
        std::uint64_t ahead = 0;
    };

    void DoTasks() {
        eventfd_t count = 0;
        eventfd_read(wake_, &count);
        std::vector<std::packaged_task<void()>> now;
        {
            const std::lock_guard lock(mutex_);
            now.swap(tasks_);
        }
        for (auto& task : now) {
            task();
        }
    }

    const int wake_;
    AdvancedLoop loop_;
    std::unique_ptr<UsbIpServer> server_;
    std::mutex mutex_;  // guards `tasks`
    std::vector<std::packaged_task<void()>> tasks_;
    std::thread thread_;
};

}  // namespace Varnholt::Simulator
