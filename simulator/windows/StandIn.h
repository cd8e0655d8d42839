/* Between the two halves of a stand-in for a kernel driver of the instrument: the driver proper (C, loaded by
 * Wine as a kernel driver), which knows device objects and request packets, and the simulated instruments
 * with the drivers' behaviour (C++, an ordinary library beside the driver).
 *
 * The driver calls from one thread, the one on which Wine dispatches all requests; completions arrive on any
 * thread. `Status` is the kernel's NTSTATUS. */
#ifndef OSTRA_SIMULATOR_WINDOWS_STAND_IN_H
#define OSTRA_SIMULATOR_WINDOWS_STAND_IN_H

#ifdef ostra_stand_in_EXPORTS
#define STAND_IN_API __declspec(dllexport)
#else
#define STAND_IN_API __declspec(dllimport)
#endif

#ifdef __cplusplus
extern "C" {
#endif

typedef long Status;

typedef struct StandInInstrument StandInInstrument;
typedef struct StandInFile StandInFile;

/* A request of the driver's. `packet` is the driver's own and `number` its name for the request, unique for
 * ever. */
typedef struct {
    void* packet;
    unsigned long number;
    /* Called before the request goes to the instrument, if it does: from then on it can complete at any time.
     */
    void (*pending)(void* packet);
    /* Called once for a request that became pending. */
    void (*completed)(void* packet, Status status, unsigned long bytes);
} StandInRequest;

/* Plugs in instrument number `index` (its serial number and its noise tell it from others). Null without
 * memory. */
STAND_IN_API StandInInstrument* StandInPlugIn(unsigned long index);
/* Unplugs it: what runs on it ends. The object is gone with its last file. */
STAND_IN_API void StandInUnplug(StandInInstrument* instrument);

/* Whether somebody else has taken the device, or takes it when its last file is closed. */
STAND_IN_API int StandInIsUsedElsewhere(const StandInInstrument* instrument);

/* Opens the device (pipe 0) or a pipe; `usbIo` chooses the driver's behaviour. */
STAND_IN_API Status StandInOpen(StandInInstrument* instrument, int usbIo, unsigned long pipe,
                                StandInFile** file);
/* What still runs on the file is cancelled and completes. */
STAND_IN_API void StandInClose(StandInFile* file);

/* Start a request: either the final status with `*bytes` set, or STATUS_PENDING after `pending` was called.
 * The buffers outlive the request. */
STAND_IN_API Status StandInTransfer(StandInFile* file, int reads, void* buffer, unsigned long length,
                                    StandInRequest request, unsigned long* bytes);
STAND_IN_API Status StandInControl(StandInFile* file, unsigned long code, const void* input,
                                   unsigned long inputLength, void* output, unsigned long outputLength,
                                   StandInRequest request, unsigned long* bytes);
/* Harmless when the request has completed. */
STAND_IN_API void StandInCancel(StandInFile* file, unsigned long requestNumber);

#ifdef __cplusplus
}
#endif

#endif
