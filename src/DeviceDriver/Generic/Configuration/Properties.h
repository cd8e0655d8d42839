#pragma once

#include <cstddef>
#include <cstdint>
#include <list>
#include <string>
#include <utility>
#include <vector>

#include "DeviceDriver/Generic/Configuration/Property.h"

namespace Varnholt::DeviceDriver::Generic::Configuration {

/// A named collection of values, each filed under a 16-bit identifier, in the order in which the identifiers
/// were first stored. Takes no lock: one thread at a time.
class Properties final {
  public:
    using Datastore = std::list<std::pair<std::uint16_t, Property>>;

    Properties() = default;
    explicit Properties(const std::string& nameOfCollection);

    const std::string& GetName() const { return name_; }
    void SetName(const std::string& newName);

    std::uint16_t GetItemCount() const { return static_cast<std::uint16_t>(datastore_.size()); }
    const Datastore& GetDatastore() const { return datastore_; }
    Datastore& GetDatastore() { return datastore_; }
    bool Contains(std::uint16_t id) const;
    /// An absent identifier is refused with `ResourceException` "id N doesn't exist".
    const Property& GetProperty(std::uint16_t id) const;
    Property& GetProperty(std::uint16_t id);
    /// Replaces the value in its place, or appends it when the identifier is new.
    void SetProperty(std::uint16_t id, const Property& value);
    std::list<std::uint16_t> GetPropertyKeys() const;

    /// What `Dump` writes with the same flag, in bytes.
    std::size_t SizeOf(bool valuesOnly) const;
    /// Writes for each entry its identifier (2 bytes, unless `valuesOnly`) and its value (4 bytes an element)
    /// from `first` on, and leaves the bytes behind as they were. A range that is too short is refused with
    /// `ResourceException` before anything is written; an entry without a type with `RuntimeException`, the
    /// entries before it written.
    void Dump(std::vector<std::uint8_t>::iterator first, std::vector<std::uint8_t>::iterator last,
              bool valuesOnly, bool bigEndian) const;

    static std::string GetExceptionText(std::uint16_t id);

  private:
    Datastore datastore_;
    std::string name_;
};

}  // namespace Varnholt::DeviceDriver::Generic::Configuration
