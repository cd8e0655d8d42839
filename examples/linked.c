/* The same as readout.c for a host that is linked with the library: takes a readout and shows it.
 *
 *     linked [INSTRUMENT] */
#include <ostra.h>
#include <stdio.h>

int main(int argc, char** argv) {
    int32_t values[OSTRA_READOUT_VALUES];
    if (d4fb86cecc88582a(values, argc > 1 ? argv[1] : "") != OSTRA_OK) {
        const char* reason = b5ae189db26b2a1b("LastError");
        fprintf(stderr, "no readout: %s\n", *reason ? reason : "no such instrument is connected");
        return 1;
    }
    for (int i = 0; i < OSTRA_READOUT_VALUES; i++)
        printf("%6d%c", values[i], i % 8 == 7 ? '\n' : ' ');
    return 0;
}
