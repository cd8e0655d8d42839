#include "UsbIo/CUsbIoThread.h"

#include <cstring>
#include <utility>

namespace Varnholt::UsbIo {

using namespace Protocol::UsbIoDriver;
using Platform::CriticalSection;
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
    if (buffer.Size > 0) {
        std::memset(buffer.Buffer, 0, buffer.Size);
    }
    buffer.NumberOfBytesToTransfer = buffer.Size;
    buffer.BytesTransferred = 0;
}

void CUsbIoThread::OnBufferError(CUsbIoBuffer&) {}

void CUsbIoThread::OnThreadExit() {}

bool CUsbIoThread::StartThread(std::uint32_t maxErrorCount) {
    CriticalSection::Holder hold(startLock);
    if (threadHandle != NoHandle) {
        return false;
    }
    TerminateFlag = false;
    MaxErrorCount = maxErrorCount;
    stopEvent = Platform::OwnedHandle(Platform::MakeAutoResetEvent());
    if (!stopEvent) {
        return false;
    }
    threadId = std::thread::id();
    threadHandle = Platform::StartThread(&ThreadProcedure, this);
    return threadHandle != NoHandle;
}

std::uint32_t CUsbIoThread::ThreadProcedure(void* self) {
    auto& thread = *static_cast<CUsbIoThread*>(self);
    // A thread that is done at once must find its handle stored, or the handle would stay behind.
    { CriticalSection::Holder hold(thread.startLock); }
    thread.threadId = std::this_thread::get_id();
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
    const Platform::Handle handle = thread.threadHandle.exchange(NoHandle);
    if (handle != NoHandle) {
        Platform::Close(handle);
    }
    return 0;
}

bool CUsbIoThread::ShutdownThread() {
    const bool onThreadItself = threadHandle != NoHandle && threadId.load() == std::this_thread::get_id();
    const Platform::Handle handle = onThreadItself ? NoHandle : threadHandle.exchange(NoHandle);
    if (handle == NoHandle && !onThreadItself) {
        return true;
    }
    TerminateFlag = true;
    StopTransfers();
    // A transfer that the thread started after `StopTransfers` would be waited for without limit.
    Platform::SignalEvent(stopEvent.Get());
    if (onThreadItself) {
        return false;
    }
    const bool ended = Platform::Wait(handle, Platform::Infinite) == Platform::WaitResult::Signalled;
    Platform::Close(handle);
    return ended;
}

bool CUsbIoThread::MustEnd() const {
    return TerminateFlag || errorCount > MaxErrorCount;
}

void CUsbIoThread::AppendPending(HeldBuffer buffer) {
    CUsbIoBuffer* const pending = buffer.release();
    pending->Next = nullptr;
    (lastPending ? lastPending->Next : firstPending) = pending;
    lastPending = pending;
}

CUsbIoThread::HeldBuffer CUsbIoThread::RemoveFirstPending() {
    CUsbIoBuffer* const buffer = firstPending;
    firstPending = std::exchange(buffer->Next, nullptr);
    if (!firstPending) {
        lastPending = nullptr;
    }
    return Hold(buffer);
}

void CUsbIoThread::WaitForFirstPending() {
    const std::uint32_t status = WaitForCompletion(*firstPending, Platform::Infinite, stopEvent.Get());
    if (status == Status::UserEvent) {
        CancelIo();
        WaitForCompletion(*firstPending, Platform::Infinite);
    }
    CancelToCompletion(*firstPending);  // where a wait was refused
}

CUsbIoThread::HeldBuffer CUsbIoThread::TakeCompleted() {
    WaitForFirstPending();
    CUsbIoBuffer& buffer = *firstPending;
    if (buffer.Status == Status::Success) {
        errorCount = 0;
    } else {
        if (buffer.Status != Status::DevicePoweredDown) {
            ++errorCount;
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
