#pragma once

#include <pybind11/pybind11.h>

#include <cstdint>
#include <string_view>
#include <vector>

#include "Protocol/Instrument.h"
#include "Service/Failure.h"
#include "Service/Memory/EepromImage.h"

namespace Varnholt::Python {

inline pybind11::bytes BytesOf(const std::vector<std::uint8_t>& content) {
    return {reinterpret_cast<const char*>(content.data()), content.size()};
}

inline std::vector<std::uint8_t> VectorOf(const pybind11::bytes& content) {
    const std::string_view view = content;
    return {view.begin(), view.end()};
}

/// `Failure` where it has another size.
inline Service::EepromImage ImageFrom(const pybind11::bytes& content) {
    Service::EepromImage image = VectorOf(content);
    if (image.size() != Protocol::EepromSize) {
        throw Service::Failure(Service::FailureKind::BadData,
                               "an image has 8192 bytes, not " + std::to_string(image.size()));
    }
    return image;
}

}  // namespace Varnholt::Python
