#pragma once

#include <string>
#include <vector>

#include "Service/Memory/EepromImage.h"

namespace Varnholt::Service {

/// One thing that was found out about an image.
struct ImageFinding {
    enum class Severity {
        Fine,
        Note,     ///< worth knowing
        Warning,  ///< the driver can use the image all the same
        Error,    ///< the driver cannot use it, or would lose something
    };
    Severity severity;
    std::string area;
    std::string text;
};

/// Looks at every part of an image, whatever it holds: header and entries of the allocation table, both
/// copies of the log, calibration, and the areas outside the table; and at what the driver would use.
std::vector<ImageFinding> CheckImage(const EepromImage& image);

/// "empty", or how many of its bytes are used.
std::string UseOfBinaryBlock(const EepromImage& image);

/// Nothing in it is an error.
bool IsSane(const std::vector<ImageFinding>& findings);

/// The errors alone, in a line; empty where there are none.
std::string ErrorsOf(const std::vector<ImageFinding>& findings);

/// "ok", "note", "warning", "error"
const char* NameOf(ImageFinding::Severity severity);

}  // namespace Varnholt::Service
