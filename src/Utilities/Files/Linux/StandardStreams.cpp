#include "Utilities/Files/Linux/StandardStreams.h"

#include <fcntl.h>
#include <unistd.h>

#include <initializer_list>

namespace Varnholt::Utilities::Files {

void SecureStandardStreams() {
    for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
        if (fcntl(stream, F_GETFD) < 0) {
            // The lowest free number is this one. Results that nobody gets are a failure, messages are not.
            (void)open("/dev/null", stream == STDERR_FILENO ? O_WRONLY : O_RDONLY);
        }
    }
}

}  // namespace Varnholt::Utilities::Files
