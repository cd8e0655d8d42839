#include "Driver.h"

#ifdef OSTRA_USBIO
static const GUID interfaceClass = {
    0x989D6515, 0xE122, 0x4442, {0xA3, 0x57, 0x75, 0x14, 0x57, 0xF1, 0x02, 0xA5}};
#else
static const GUID interfaceClass = {
    0x00873FDF, 0x61A8, 0x11D1, {0xAA, 0x5E, 0x00, 0xC0, 0x4F, 0xB1, 0x72, 0x8B}};
#endif

NTSTATUS CompleteAtOnce(IRP* packet, NTSTATUS status, ULONG_PTR bytes) {
    packet->IoStatus.Status = status;
    packet->IoStatus.Information = bytes;
    IoCompleteRequest(packet, IO_NO_INCREMENT);
    return status;
}

static NTSTATUS PassDown(DEVICE_OBJECT* device, IRP* packet) {
    IoSkipCurrentIrpStackLocation(packet);
    return IoCallDriver(ExtensionOf(device)->below, packet);
}

static NTSTATUS NTAPI AddDevice(DRIVER_OBJECT* driver, DEVICE_OBJECT* physical) {
    static ULONG deviceCount;
    DEVICE_OBJECT* device;
    NTSTATUS status =
        IoCreateDevice(driver, sizeof(DeviceExtension), NULL, FILE_DEVICE_UNKNOWN, 0, FALSE, &device);
    if (status != STATUS_SUCCESS)
        return status;
    DeviceExtension* extension = ExtensionOf(device);
    RtlZeroMemory(extension, sizeof *extension);
    extension->index = deviceCount++;
    extension->instrument = StandInPlugIn(extension->index);
    extension->below = IoAttachDeviceToDeviceStack(device, physical);
    status = extension->instrument && extension->below
                 ? IoRegisterDeviceInterface(physical, &interfaceClass, NULL, &extension->link)
                 : STATUS_INSUFFICIENT_RESOURCES;
    if (status != STATUS_SUCCESS) {
        if (extension->instrument)
            StandInUnplug(extension->instrument);
        if (extension->below)
            IoDetachDevice(extension->below);
        IoDeleteDevice(device);
        return status;
    }
    device->Flags |= DO_BUFFERED_IO;
    device->Flags &= ~(ULONG)DO_DEVICE_INITIALIZING;
    return STATUS_SUCCESS;
}

static NTSTATUS Start(DEVICE_OBJECT* device, IRP* packet) {
    NTSTATUS status = IoSetDeviceInterfaceState(&ExtensionOf(device)->link, TRUE);
    if (status == STATUS_SUCCESS)
        status = ShowPipes(device);
    if (status != STATUS_SUCCESS)
        return CompleteAtOnce(packet, status, 0);
    packet->IoStatus.Status = STATUS_SUCCESS;
    return PassDown(device, packet);
}

/* The instrument is gone, whether it was pulled out or its device is taken away in an orderly manner. */
static void Unplug(DEVICE_OBJECT* device) {
    DeviceExtension* extension = ExtensionOf(device);
    if (!extension->instrument)
        return;
    IoSetDeviceInterfaceState(&extension->link, FALSE);
    HidePipes(device);
    StandInUnplug(extension->instrument);
    extension->instrument = NULL;
}

static NTSTATUS NTAPI DispatchPnp(DEVICE_OBJECT* device, IRP* packet) {
    DeviceExtension* extension = ExtensionOf(device);
    if (extension->pipe)
        return CompleteAtOnce(packet, STATUS_NOT_SUPPORTED, 0);
    switch (IoGetCurrentIrpStackLocation(packet)->MinorFunction) {
        case IRP_MN_START_DEVICE:
            return Start(device, packet);
        case IRP_MN_SURPRISE_REMOVAL:
            Unplug(device);
            packet->IoStatus.Status = STATUS_SUCCESS;
            return PassDown(device, packet);
        case IRP_MN_REMOVE_DEVICE: {
            Unplug(device);
            DEVICE_OBJECT* below = extension->below;
            packet->IoStatus.Status = STATUS_SUCCESS;
            const NTSTATUS status = PassDown(device, packet);
            RtlFreeUnicodeString(&extension->link);
            IoDetachDevice(below);
            IoDeleteDevice(device);
            return status;
        }
        default:
            return PassDown(device, packet);
    }
}

static NTSTATUS NTAPI DispatchOther(DEVICE_OBJECT* device, IRP* packet) {
    if (ExtensionOf(device)->pipe)
        return CompleteAtOnce(packet, STATUS_NOT_SUPPORTED, 0);
    return PassDown(device, packet);
}

static void NTAPI Unload(DRIVER_OBJECT* driver) {
    (void)driver;
}

NTSTATUS NTAPI DriverEntry(DRIVER_OBJECT* driver, UNICODE_STRING* registryPath) {
    (void)registryPath;
    driver->DriverExtension->AddDevice = AddDevice;
    driver->DriverUnload = Unload;
    driver->MajorFunction[IRP_MJ_CREATE] = DispatchCreate;
    driver->MajorFunction[IRP_MJ_CLOSE] = DispatchClose;
    driver->MajorFunction[IRP_MJ_READ] = DispatchTransfer;
    driver->MajorFunction[IRP_MJ_WRITE] = DispatchTransfer;
    driver->MajorFunction[IRP_MJ_DEVICE_CONTROL] = DispatchControl;
    driver->MajorFunction[IRP_MJ_PNP] = DispatchPnp;
    driver->MajorFunction[IRP_MJ_POWER] = DispatchOther;
    driver->MajorFunction[IRP_MJ_SYSTEM_CONTROL] = DispatchOther;
    return STATUS_SUCCESS;
}
