/* A host program in C: loads the library, writes an EEPROM image if one is given, takes a readout and shows
 * it.
 *
 *     readout LIBRARY [INSTRUMENT [IMAGE-FILE]]
 *
 * INSTRUMENT is an identifier as `ostra list` shows it; "" or nothing takes the first that answers. */
#include <stdint.h>
#include <stdio.h>
#include <string.h>

#include "ostra.h"

#ifdef _WIN32
#include <windows.h>
#define OPEN(file) ((void*)LoadLibraryA(file))
#define FIND(library, name) ((void*)GetProcAddress((HMODULE)(library), name))
#else
#include <dlfcn.h>
#define OPEN(file) dlopen(file, RTLD_NOW)
#define FIND(library, name) dlsym(library, name)
#endif

typedef int32_t(OSTRA_CALL* WriteImage)(const uint8_t* image, const char* instrument);
typedef int32_t(OSTRA_CALL* TakeReadout)(int32_t* values, const char* instrument);
typedef const char*(OSTRA_CALL* GetInformation)(const char* key);

/* Functions and data pointers convert into each other only through memory. */
#define LOAD(library, function, name) (*(void**)&(function) = FIND(library, name))

int main(int argc, char** argv) {
    void* library = argc > 1 ? OPEN(argv[1]) : NULL;
    const char* instrument = argc > 2 ? argv[2] : "";
    WriteImage writeImage;
    TakeReadout takeReadout;
    GetInformation getInformation;
    if (!library || !LOAD(library, writeImage, "f3355d91d5df0e0b") ||
        !LOAD(library, takeReadout, "d4fb86cecc88582a") ||
        !LOAD(library, getInformation, "b5ae189db26b2a1b")) {
        fprintf(stderr, "usage: %s LIBRARY [INSTRUMENT [IMAGE-FILE]]\n", argv[0]);
        return 2;
    }
    if (argc > 3) {
        static uint8_t image[OSTRA_IMAGE_SIZE + 1];
        FILE* file = fopen(argv[3], "rb");
        if (!file || fread(image, 1, sizeof image, file) != OSTRA_IMAGE_SIZE) {
            fprintf(stderr, "%s: not a file of %d bytes\n", argv[3], OSTRA_IMAGE_SIZE);
            return 2;
        }
        fclose(file);
        if (writeImage(image, instrument) != OSTRA_OK) {
            fprintf(stderr, "image not written: %s\n", getInformation("LastError"));
            return 1;
        }
    }
    int32_t values[OSTRA_READOUT_VALUES];
    if (takeReadout(values, instrument) != OSTRA_OK) {
        const char* reason = getInformation("LastError");
        fprintf(stderr, "no readout: %s\n", *reason ? reason : "no such instrument is connected");
        return 1;
    }
    for (int i = 0; i < OSTRA_READOUT_VALUES; i++)
        printf("%6d%c", values[i], i % 8 == 7 ? '\n' : ' ');
    return 0;
}
