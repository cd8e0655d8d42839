#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <thread>

#include "Platform/Threads.h"
#include "UsbIo/CUsbIoBufferPool.h"
#include "UsbIo/CUsbIoPipe.h"

namespace Varnholt::UsbIo {

/// A pipe with a thread of its own that keeps transfers running over a pool of buffers. The virtual
/// operations run on that thread and throw nothing; something thrown all the same ends the thread.
///
/// The owner calls `StartThread` and `ShutdownThread`, and calls the latter before the object (or the derived
/// object, whose operations the thread calls) is destroyed.
class CUsbIoThread : public CUsbIoPipe {
  public:
    ~CUsbIoThread() override;

    /// As the operations of `CUsbIoBufferPool`; not while the thread runs.
    bool AllocateBuffers(std::uint32_t sizeOfBuffer, std::uint32_t numberOfBuffers);
    void FreeBuffers();

    /// False when a thread is there already or none can be started. The thread ends by itself after more
    /// than `maxErrorCount` failed transfers in a row.
    bool StartThread(std::uint32_t maxErrorCount = 3);
    /// Ends the thread and waits for its end; true when no thread is left. Called on the thread itself it
    /// only asks for the end and answers false.
    bool ShutdownThread();

    /// What the thread takes as its priority when it starts.
    int ThreadPriority = Platform::HighestThreadPriority;

  protected:
    CUsbIoThread() = default;

    /// A transfer of the buffer has ended, well or not.
    virtual void OnBufferCompleted(CUsbIoBuffer& buffer);
    /// Makes a buffer ready for its next transfer: all of it, zeros. No bytes, or `OperationFinished`, mean
    /// that there is no further transfer.
    virtual void PrepareBuffer(CUsbIoBuffer& buffer);
    /// The transfer of the buffer failed; `Status` says why.
    virtual void OnBufferError(CUsbIoBuffer& buffer);
    virtual void OnThreadExit();
    /// The thread's work.
    virtual void ThreadRoutine() = 0;
    /// Ends the running transfers; called on the thread of `ShutdownThread`.
    virtual void StopTransfers() = 0;

    /// The rest is for `ThreadRoutine`.
    bool MustEnd() const;
    /// A buffer that is in nobody's list goes back to the pool, also when a virtual operation throws.
    struct PutBack {
        CUsbIoBufferPool* pool;
        void operator()(CUsbIoBuffer* buffer) const { pool->Put(buffer); }
    };
    using HeldBuffer = std::unique_ptr<CUsbIoBuffer, PutBack>;
    /// Null when none is free.
    HeldBuffer TakeFree() { return Hold(BufferPool.Get()); }
    void AppendPending(HeldBuffer buffer);
    bool HasPending() const { return firstPending_ != nullptr; }
    /// Waits without limit (on Linux a write ends after 5 s and 10 ms a byte) for the first pending buffer,
    /// takes it off the list and counts and reports an error. The transfers of this thread are cancelled when
    /// `ShutdownThread` asks for the end meanwhile.
    HeldBuffer TakeCompleted();
    /// Waits for all that is pending and puts it back into the pool.
    void DrainPending();

    CUsbIoBufferPool BufferPool;
    std::atomic<bool> TerminateFlag = false;
    std::uint32_t MaxErrorCount = 3;
    std::uint32_t errorCount_ = 0;  ///< failed transfers since the last good one

  private:
    static std::uint32_t ThreadProcedure(void* self);
    HeldBuffer Hold(CUsbIoBuffer* buffer) { return HeldBuffer(buffer, PutBack{&BufferPool}); }
    void WaitForFirstPending();
    HeldBuffer RemoveFirstPending();

    std::atomic<Platform::Handle> threadHandle_ = Platform::NoHandle;  ///< null while no thread runs
    std::atomic<std::thread::id> threadId_;                            ///< of the running thread
    Platform::RecursiveMutex startLock_;  ///< held until the new thread's handle is stored
    Platform::OwnedHandle stopEvent_;     ///< wakes the thread from the wait for a transfer
    // The list of the running transfers, in the order of their start; the thread's own.
    CUsbIoBuffer* firstPending_ = nullptr;
    CUsbIoBuffer* lastPending_ = nullptr;
};

}  // namespace Varnholt::UsbIo
