#include "DeviceDriver/Generic/Configuration/Property.h"

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Generic/Utilities/EndianConversion.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Generic::Configuration {

namespace EndianConversion = Utilities::EndianConversion;

namespace {

constexpr const char* InvalidType = "Invalid configuration data type.";

}  // namespace

Property::Property(const std::vector<float>& values) try : floats_(values), type_(TypeFloatVector) {}
TRACED

Property::Property(const std::vector<std::int32_t>& values) try : longs_(values), type_(TypeLongVector) {}
TRACED

Property::Property(float value) try : floats_(1, value), type_(TypeFloat) {}
TRACED

Property::Property(std::int32_t value) try : longs_(1, value), type_(TypeLong) {}
TRACED

Property::Property(std::int16_t value) try : longs_(1, value), type_(TypeLong) {}
TRACED

Property::Property(std::int8_t value) try : longs_(1, value), type_(TypeLong) {}
TRACED

Property& Property::Assign(float value) try {
    AssignInternal(std::vector<float>(1, value), TypeFloat);
    return *this;
}
TRACED

Property& Property::Assign(std::int32_t value) try {
    AssignInternal(std::vector<std::int32_t>(1, value), TypeLong);
    return *this;
}
TRACED

Property& Property::Assign(std::int16_t value) try {
    AssignInternal(std::vector<std::int32_t>(1, value), TypeLong);
    return *this;
}
TRACED

Property& Property::Assign(std::int8_t value) try {
    AssignInternal(std::vector<std::int32_t>(1, value), TypeLong);
    return *this;
}
TRACED

Property& Property::Assign(const std::vector<float>& values) try {
    AssignInternal(values, TypeFloatVector);
    return *this;
}
TRACED

Property& Property::Assign(const std::vector<std::int32_t>& values) try {
    AssignInternal(values, TypeLongVector);
    return *this;
}
TRACED

Property& Property::Assign(std::span<const std::uint8_t> bytes, bool bigEndian) try {
    const std::size_t count = bytes.size() / ElementSize;
    switch (type_) {
        case TypeLong:
        case TypeLongVector:
            longs_.resize(count);
            for (std::size_t i = 0; i < count; ++i) {
                EndianConversion::ByteArrayToLong(&bytes[ElementSize * i], longs_[i], bigEndian);
            }
            return *this;
        case TypeFloat:
        case TypeFloatVector:
            floats_.resize(count);
            for (std::size_t i = 0; i < count; ++i) {
                EndianConversion::ByteArrayToFloat(&bytes[ElementSize * i], floats_[i], bigEndian);
            }
            return *this;
        case TypeNone:
            break;
    }
    throw RuntimeException(InvalidType, Here());
}
TRACED

void Property::AssignInternal(const std::vector<float>& values, PropertyType newType) try {
    floats_ = values;
    longs_.clear();
    type_ = newType;
}
TRACED

void Property::AssignInternal(const std::vector<std::int32_t>& values, PropertyType newType) try {
    longs_ = values;
    floats_.clear();
    type_ = newType;
}
TRACED

std::size_t Property::SizeOf() const {
    switch (type_) {
        case TypeLong:
        case TypeLongVector:
            return ElementSize * longs_.size();
        case TypeFloat:
        case TypeFloatVector:
            return ElementSize * floats_.size();
        case TypeNone:
            break;
    }
    return 0;
}

std::int32_t Property::AsLong() const try {
    if (longs_.empty()) {
        throw RuntimeException(InvalidType, Here());
    }
    return longs_.front();
}
TRACED

float Property::AsFloat() const try {
    if (floats_.empty()) {
        throw RuntimeException(InvalidType, Here());
    }
    return floats_.front();
}
TRACED

std::vector<std::uint8_t> Property::AsByteVector(bool bigEndian) const try {
    if (type_ < TypeLong || type_ > TypeFloatVector) {
        throw RuntimeException(InvalidType, Here());
    }
    std::vector<std::uint8_t> bytes(SizeOf());
    WriteBytes(bytes.data(), bigEndian);
    return bytes;
}
TRACED

void Property::WriteBytes(std::uint8_t* bytes, bool bigEndian) const {
    switch (type_) {
        case TypeLong:
        case TypeLongVector:
            for (const std::int32_t value : longs_) {
                EndianConversion::LongToByteArray(value, bytes, bigEndian);
                bytes += ElementSize;
            }
            return;
        case TypeFloat:
        case TypeFloatVector:
            for (const float& value : floats_) {
                EndianConversion::FloatToByteArray(value, bytes, bigEndian);
                bytes += ElementSize;
            }
            return;
        case TypeNone:
            break;
    }
    AsByteVector(bigEndian);  // which refuses it
}

}  // namespace Varnholt::DeviceDriver::Generic::Configuration
