/* The driver library of the hand-held optical measuring instrument: its four functions.
 *
 * Windows: ostra.dll, 32-bit, C calling convention (the caller removes the arguments), undecorated names,
 * ordinals 8, 5, 6 and 7 in the order below. Linux: libostra.so, the same names.
 *
 * Naming an instrument: `device_name` is the identifier that enumeration gives it (the path of its device
 * interface; `ostra list` shows them), compared byte for byte. An empty name takes the first instrument that
 * answers.
 *
 * Results: the two instrument functions return one of the OSTRA_ codes. After a failure, fetch its text with
 * b5ae189db26b2a1b("LastError") before anything else is called. An empty text means that no instrument with
 * the name answered. No exception leaves the library, and nothing of a call outlives it: no thread, handle or
 * instrument.
 *
 * Texts belong to the library: do not free them. A text of b5ae189db26b2a1b is valid until the next call of
 * that function, the one of c288a3930ffaa9d7 until the library is unloaded.
 *
 * Threads: call one function at a time; the last-error text is shared by all callers.
 *
 *     int32_t values[OSTRA_READOUT_VALUES];
 *     if (d4fb86cecc88582a(values, "") != OSTRA_OK) {
 *         fprintf(stderr, "readout failed: %s\n", b5ae189db26b2a1b("LastError"));
 *         return 1;
 *     }
 *     for (int i = 0; i < OSTRA_READOUT_VALUES; i++)
 *         printf("%d\n", values[i]);
 */
#ifndef OSTRA_H
#define OSTRA_H

#include <stdint.h>

#if defined(_WIN32)
#define OSTRA_CALL __cdecl
#else
#define OSTRA_CALL
#endif
#if defined(OSTRA_BUILDING) && !defined(_WIN32)
#define OSTRA_EXPORT __attribute__((visibility("default")))
#else
#define OSTRA_EXPORT
#endif

/* Result codes. */
#define OSTRA_OK 0
#define OSTRA_FAILURE 1 /* readout only: the text of "LastError" says what failed */
#define OSTRA_UNKNOWN_FAILURE \
    99 /* image write: any failure; readout: one that has no text but "unknown error" */

/* Bytes of an EEPROM image; values of a readout. */
#define OSTRA_IMAGE_SIZE 8192
#define OSTRA_READOUT_VALUES 128

#ifdef __cplusplus
extern "C" {
#endif

/* Writes the OSTRA_IMAGE_SIZE bytes at `image` into the EEPROM of the named instrument, in pieces of 256
 * bytes in increasing order. Nothing is checked and nothing is read back. After a failure the EEPROM holds
 * the pieces written before it. Null pointers are refused with OSTRA_UNKNOWN_FAILURE. */
OSTRA_EXPORT int32_t OSTRA_CALL f3355d91d5df0e0b(const uint8_t* image, const char* device_name);

/* Takes one readout and stores OSTRA_READOUT_VALUES raw values (-2047 to 63488, sensor order; the first and
 * the last repeat their neighbour) at `values`, which is untouched after a failure. Takes a little over one
 * second. */
OSTRA_EXPORT int32_t OSTRA_CALL d4fb86cecc88582a(int32_t* values, const char* device_name);

/* Answers an information query, never null: "LastError" the text of the last failure; "SDKVersion" the
 * version of this interface, "1.0.3"; any other key an empty text. All but "LastError" clear the last error.
 */
OSTRA_EXPORT const char* OSTRA_CALL b5ae189db26b2a1b(const char* key);

/* Returns an empty text and clears the last error. */
OSTRA_EXPORT const char* OSTRA_CALL c288a3930ffaa9d7(void);

#ifdef __cplusplus
}
#endif

#endif
