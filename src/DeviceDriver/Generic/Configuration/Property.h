#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

namespace Varnholt::DeviceDriver::Generic::Configuration {

enum PropertyType : std::int32_t {
    TypeNone = -1,
    TypeLong = 0,
    TypeLongVector = 1,
    TypeFloat = 2,
    TypeFloatVector = 3,
};

/// A configuration value: one or more 32-bit integers or 32-bit floats. The type is set by construction or by
/// a typed `Assign`; only then can bytes be read into the value.
class Property final {
  public:
    static constexpr std::size_t ElementSize = 4;  ///< bytes of an integer or a float

    Property() = default;
    explicit Property(const std::vector<float>& values);
    explicit Property(const std::vector<std::int32_t>& values);
    explicit Property(float value);
    explicit Property(std::int32_t value);
    explicit Property(std::int16_t value);
    explicit Property(std::int8_t value);

    Property& Assign(float value);
    Property& Assign(std::int32_t value);
    Property& Assign(std::int16_t value);
    Property& Assign(std::int8_t value);
    Property& Assign(const std::vector<float>& values);
    Property& Assign(const std::vector<std::int32_t>& values);
    /// Refills the value with as many elements as `bytes` has whole groups of 4, and keeps the type: a
    /// `TypeLong` may so come to hold several integers, or none. Without a type: `RuntimeException`.
    Property& Assign(std::span<const std::uint8_t> bytes, bool bigEndian);

    void AssignInternal(const std::vector<float>& values, PropertyType newType);
    void AssignInternal(const std::vector<std::int32_t>& values, PropertyType newType);

    PropertyType GetType() const { return type_; }
    /// Bytes of `AsByteVector`; 0 without a type.
    std::size_t SizeOf() const;

    /// The first element; `RuntimeException` when there is none.
    std::int32_t AsLong() const;
    float AsFloat() const;
    /// Empty when the value is of the other kind.
    const std::vector<std::int32_t>& AsLongVector() const { return longs_; }
    const std::vector<float>& AsFloatVector() const { return floats_; }
    /// 4 bytes for each element. Without a type: `RuntimeException`.
    std::vector<std::uint8_t> AsByteVector(bool bigEndian) const;
    /// The same into `bytes`, which has room for `SizeOf` bytes.
    void WriteBytes(std::uint8_t* bytes, bool bigEndian) const;

  private:
    // At most one of the two is non-empty: the one that the type names.
    std::vector<float> floats_;
    std::vector<std::int32_t> longs_;
    PropertyType type_ = TypeNone;
};

}  // namespace Varnholt::DeviceDriver::Generic::Configuration
