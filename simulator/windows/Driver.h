/* The driver half of the stand-in. One source for both drivers: with OSTRA_USBIO it presents the interface
 * class of the USBIO driver, otherwise that of the instrument's own driver with its three pipes. */
#ifndef OSTRA_SIMULATOR_WINDOWS_DRIVER_H
#define OSTRA_SIMULATOR_WINDOWS_DRIVER_H

#include <wdm.h>

#include "StandIn.h"

#ifdef OSTRA_USBIO
#define PIPE_COUNT 0
#else
#define PIPE_COUNT 3
#endif

/* Of the device and of each of its pipes. */
typedef struct {
    StandInInstrument* instrument; /* null once it was unplugged */
    ULONG pipe;                    /* 0: the device itself */
    ULONG openFiles;

    /* The device only. */
    ULONG index;
    DEVICE_OBJECT* below;
    UNICODE_STRING link; /* \??\NAME, the device interface */
    DEVICE_OBJECT* pipes[3];
    HANDLE pipeDirectory;
} DeviceExtension;

static inline DeviceExtension* ExtensionOf(DEVICE_OBJECT* device) {
    return (DeviceExtension*)device->DeviceExtension;
}

NTSTATUS CompleteAtOnce(IRP* packet, NTSTATUS status, ULONG_PTR bytes);

/* Requests.c */
NTSTATUS NTAPI DispatchCreate(DEVICE_OBJECT* device, IRP* packet);
NTSTATUS NTAPI DispatchClose(DEVICE_OBJECT* device, IRP* packet);
NTSTATUS NTAPI DispatchTransfer(DEVICE_OBJECT* device, IRP* packet);
NTSTATUS NTAPI DispatchControl(DEVICE_OBJECT* device, IRP* packet);

/* PipeNames.c */
NTSTATUS ShowPipes(DEVICE_OBJECT* device);
void HidePipes(DEVICE_OBJECT* device);

#endif
