#include "UsbIo/CUsbIoThread.h"

#include <algorithm>
#include <cstdint>
#include <mutex>
#include <utility>

namespace Varnholt::UsbIo {

using namespace Protocol::UsbIoDriver;
using Platform::NoHandle;

CUsbIoThread::~CUsbIoThread() {
    FreeBuffers();
}

bool CUsbIoThread::AllocateBuffers(std::uint32_t sizeOfBuffer, std::uint32_t numberOfBuffers) {
    return BufferPool.Allocate(sizeOfBuffer, numberOfBuffers);
}

void CUsbIoThread::FreeBuffers() {
    BufferPool.Free();
}

void CUsbIoThread::OnBufferCompleted(CUsbIoBuffer&) {}

void CUsbIoThread::PrepareBuffer(CUsbIoBuffer& buffer) {
    std::fill_n(static_cast<std::uint8_t*>(buffer.Buffer), buffer.Size, std::uint8_t{0});
    buffer.NumberOfBytesToTransfer = buffer.Size;
    buffer.BytesTransferred = 0;
}

void CUsbIoThread::OnBufferError(CUsbIoBuffer&) {}

void CUsbIoThread::OnThreadExit() {}

bool CUsbIoThread::StartThread(std::uint32_t maxErrorCount) {
    const std::lock_guard hold(startLock_);
    if (threadHandle_ != NoHandle) {
        return false;
    }
    TerminateFlag = false;
    MaxErrorCount = maxErrorCount;
    stopEvent_ = Platform::OwnedHandle(Platform::MakeAutoResetEvent());
    if (!stopEvent_) {
        return false;
    }
    threadId_ = std::thread::id();
    threadHandle_ = Platform::StartThread(&ThreadProcedure, this);
    return threadHandle_ != NoHandle;
}

std::uint32_t CUsbIoThread::ThreadProcedure(void* self) {
    auto& thread = *static_cast<CUsbIoThread*>(self);
    // A thread that is done at once must find its handle stored, or the handle would stay behind.
    { const std::lock_guard hold(thread.startLock_); }
    thread.threadId_ = std::this_thread::get_id();
    Platform::SetCurrentThreadPriority(thread.ThreadPriority);
    try {
        thread.ThreadRoutine();
    } catch (...) {
        // The owner learns of it as of any end of the thread; the buffers must come to rest all the same.
        thread.CancelIo();
        thread.DrainPending();
    }
    try {
        thread.OnThreadExit();
    } catch (...) {
        // There is nothing left to end.
    }
    const Platform::OwnedHandle own(thread.threadHandle_.exchange(NoHandle));
    return 0;
}

bool CUsbIoThread::ShutdownThread() {
    const bool onThreadItself = threadHandle_ != NoHandle && threadId_.load() == std::this_thread::get_id();
    const Platform::OwnedHandle handle(onThreadItself ? NoHandle : threadHandle_.exchange(NoHandle));
    if (!handle && !onThreadItself) {
        return true;
    }
    TerminateFlag = true;
    StopTransfers();
    // A transfer that the thread started after `StopTransfers` would be waited for without limit.
    Platform::SignalEvent(stopEvent_.Get());
    if (onThreadItself) {
        return false;
    }
    return Platform::Wait(handle.Get(), Platform::Infinite) == Platform::WaitResult::Signalled;
}

bool CUsbIoThread::MustEnd() const {
    return TerminateFlag || errorCount_ > MaxErrorCount;
}

void CUsbIoThread::AppendPending(HeldBuffer buffer) {
    CUsbIoBuffer* const pending = buffer.release();
    pending->Next = nullptr;
    (lastPending_ ? lastPending_->Next : firstPending_) = pending;
    lastPending_ = pending;
}

CUsbIoThread::HeldBuffer CUsbIoThread::RemoveFirstPending() {
    CUsbIoBuffer* const buffer = firstPending_;
    firstPending_ = std::exchange(buffer->Next, nullptr);
    if (!firstPending_) {
        lastPending_ = nullptr;
    }
    return Hold(buffer);
}

void CUsbIoThread::WaitForFirstPending() {
    const std::uint32_t status = WaitForCompletion(*firstPending_, Platform::Infinite, stopEvent_.Get());
    if (status == Status::UserEvent) {
        CancelIo();
        WaitForCompletion(*firstPending_, Platform::Infinite);
    }
    CancelToCompletion(*firstPending_);  // where a wait was refused
}

CUsbIoThread::HeldBuffer CUsbIoThread::TakeCompleted() {
    WaitForFirstPending();
    CUsbIoBuffer& buffer = *firstPending_;
    if (buffer.Status == Status::Success) {
        errorCount_ = 0;
    } else {
        if (buffer.Status != Status::DevicePoweredDown) {
            ++errorCount_;
        }
        OnBufferError(buffer);
    }
    return RemoveFirstPending();
}

void CUsbIoThread::DrainPending() {
    while (HasPending()) {
        WaitForFirstPending();
        RemoveFirstPending();
    }
}

}  // namespace Varnholt::UsbIo
