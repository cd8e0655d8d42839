/* Request packets of open files become requests of the stand-in, and their ends complete the packets. */
#include "Driver.h"

#ifdef OSTRA_USBIO
static const int isUsbIo = 1;
#else
static const int isUsbIo = 0;
#endif

static StandInFile* FileOf(IRP* packet) {
    return (StandInFile*)IoGetCurrentIrpStackLocation(packet)->FileObject->FsContext;
}

NTSTATUS NTAPI DispatchCreate(DEVICE_OBJECT* device, IRP* packet) {
    DeviceExtension* const extension = ExtensionOf(device);
    StandInFile* file = NULL;
    NTSTATUS status = STATUS_NO_SUCH_DEVICE;
    if (extension->instrument)
        status = StandInOpen(extension->instrument, isUsbIo, extension->pipe, &file);
    IoGetCurrentIrpStackLocation(packet)->FileObject->FsContext = file;
    if (status == STATUS_SUCCESS)
        ++extension->openFiles;
    return CompleteAtOnce(packet, status, 0);
}

/* Requests of the file can still be pending: no cleanup packet comes before this one. */
NTSTATUS NTAPI DispatchClose(DEVICE_OBJECT* device, IRP* packet) {
    DeviceExtension* const extension = ExtensionOf(device);
    StandInFile* const file = FileOf(packet); /* null: was refused when it was opened */
    if (file)
        StandInClose(file);
    CompleteAtOnce(packet, STATUS_SUCCESS, 0);
    if (!file || --extension->openFiles != 0)
        return STATUS_SUCCESS;
    /* A pipe of an instrument that was unplugged has waited for its last file. */
    if (extension->pipe && !extension->instrument)
        IoDeleteDevice(device);
    /* Wine opens a file even when the driver refuses it, but not without its name. (The USBIO driver refuses
     * nothing here: its hosts learn it from a later request.) */
    else if (!isUsbIo && !extension->pipe && extension->instrument &&
             StandInIsUsedElsewhere(extension->instrument))
        IoDeleteSymbolicLink(&extension->link);
    return STATUS_SUCCESS;
}

/* Called with the cancel spin lock held, which keeps the packet from being completed meanwhile. */
static void NTAPI CancelPacket(DEVICE_OBJECT* device, IRP* packet) {
    (void)device;
    StandInFile* const file = FileOf(packet);
    const ULONG number = (ULONG)(ULONG_PTR)packet->Tail.Overlay.DriverContext[0];
    IoReleaseCancelSpinLock(packet->CancelIrql);
    StandInCancel(file, number);
}

static void PacketIsPending(void* packet) {
    IoMarkIrpPending((IRP*)packet);
    IoSetCancelRoutine((IRP*)packet, CancelPacket);
}

static void PacketCompleted(void* packet, Status status, ULONG bytes) {
    KIRQL irql;
    IoAcquireCancelSpinLock(&irql);
    IoSetCancelRoutine((IRP*)packet, NULL);
    IoReleaseCancelSpinLock(irql);
    CompleteAtOnce((IRP*)packet, status, bytes);
}

/* A file whose opening was refused: Wine opens it all the same. */
static NTSTATUS Refuse(IRP* packet) {
    return CompleteAtOnce(packet, STATUS_FILE_CLOSED, 0);
}

static StandInRequest MakeRequest(IRP* packet) {
    static LONG requestCount;
    const ULONG number = (ULONG)InterlockedIncrement(&requestCount);
    packet->Tail.Overlay.DriverContext[0] = (void*)(ULONG_PTR)number;
    const StandInRequest request = {packet, number, PacketIsPending, PacketCompleted};
    return request;
}

static NTSTATUS Started(IRP* packet, NTSTATUS status, ULONG bytes) {
    return status == STATUS_PENDING ? status : CompleteAtOnce(packet, status, bytes);
}

NTSTATUS NTAPI DispatchTransfer(DEVICE_OBJECT* device, IRP* packet) {
    (void)device;
    if (!FileOf(packet))
        return Refuse(packet);
    const IO_STACK_LOCATION* const stack = IoGetCurrentIrpStackLocation(packet);
    const int reads = stack->MajorFunction == IRP_MJ_READ;
    const ULONG length = reads ? stack->Parameters.Read.Length : stack->Parameters.Write.Length;
    ULONG bytes = 0;
    const NTSTATUS status = StandInTransfer(FileOf(packet), reads, packet->AssociatedIrp.SystemBuffer, length,
                                            MakeRequest(packet), &bytes);
    return Started(packet, status, bytes);
}

NTSTATUS NTAPI DispatchControl(DEVICE_OBJECT* device, IRP* packet) {
    (void)device;
    if (!FileOf(packet))
        return Refuse(packet);
    const IO_STACK_LOCATION* const stack = IoGetCurrentIrpStackLocation(packet);
    const ULONG code = stack->Parameters.DeviceIoControl.IoControlCode;
    void* const input = packet->AssociatedIrp.SystemBuffer;
    /* The two direct methods map the caller's output buffer, whichever way its data go. */
    void* output = input;
    if ((code & 3) == METHOD_IN_DIRECT || (code & 3) == METHOD_OUT_DIRECT)
        output =
            packet->MdlAddress ? MmGetSystemAddressForMdlSafe(packet->MdlAddress, NormalPagePriority) : NULL;
    else if ((code & 3) != METHOD_BUFFERED)
        return CompleteAtOnce(packet, STATUS_INVALID_DEVICE_REQUEST, 0);
    ULONG bytes = 0;
    const NTSTATUS status = StandInControl(
        FileOf(packet), code, input, stack->Parameters.DeviceIoControl.InputBufferLength, output,
        output ? stack->Parameters.DeviceIoControl.OutputBufferLength : 0, MakeRequest(packet), &bytes);
    return Started(packet, status, bytes);
}
