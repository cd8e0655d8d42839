#pragma once

#include <pybind11/pybind11.h>

#include <cstddef>
#include <memory>
#include <mutex>
#include <utility>
#include <vector>

#include "Host.h"

namespace Varnholt::Python {

/// Memory of one size for arrays. What an array gives back serves again: memory that is new to a process is
/// slow, as the system makes it page by page when it is touched. Any thread.
class BlockPool final {
  public:
    using Memory = std::unique_ptr<std::byte[]>;

    Memory Take(std::size_t bytes) {
        {
            const std::lock_guard held(mutex_);
            if (!spare_.empty()) {
                Memory memory = std::move(spare_.back());
                spare_.pop_back();
                return memory;
            }
        }
        return std::make_unique_for_overwrite<std::byte[]>(bytes);
    }
    void GiveBack(Memory memory) {
        const std::lock_guard held(mutex_);
        if (spare_.size() < MostSpare) {
            spare_.push_back(std::move(memory));
        }
    }

    /// What an array refers to that lies in `memory`: gives it back when the array is gone.
    static pybind11::capsule Owner(std::shared_ptr<BlockPool> pool, Memory memory) {
        auto loan = std::make_unique<Loan>(std::move(pool), std::move(memory));
        pybind11::capsule owner(loan.get(), [](void* pointer) {
            const std::unique_ptr<Loan> ended(static_cast<Loan*>(pointer));
            if (!Host::Instance().IsForked()) {  // a thread that the child lacks may have held the lock
                ended->first->GiveBack(std::move(ended->second));
            }
        });
        loan.release();
        return owner;
    }

  private:
    using Loan = std::pair<std::shared_ptr<BlockPool>, Memory>;
    static constexpr std::size_t MostSpare = 4;

    std::mutex mutex_;  // guards what follows
    std::vector<Memory> spare_;
};

}  // namespace Varnholt::Python
