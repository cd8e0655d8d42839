#include "DeviceDriver/Generic/Configuration/Properties.h"

#include <algorithm>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "DeviceDriver/Generic/Utilities/EndianConversion.h"
#include "Utilities/Exceptions/Trace.h"

namespace Varnholt::DeviceDriver::Generic::Configuration {

namespace EndianConversion = Utilities::EndianConversion;

namespace {

constexpr std::size_t IdentifierSize = 2;

template <class Store>
auto Find(Store& datastore, std::uint16_t id) {
    return std::find_if(datastore.begin(), datastore.end(),
                        [id](const auto& entry) { return entry.first == id; });
}

}  // namespace

Properties::Properties(const std::string& nameOfCollection) try : name_(nameOfCollection) {}
TRACED

void Properties::SetName(const std::string& newName) try { name_ = newName; }
TRACED

bool Properties::Contains(std::uint16_t id) const {
    return Find(datastore_, id) != datastore_.end();
}

const Property& Properties::GetProperty(std::uint16_t id) const try {
    const auto entry = Find(datastore_, id);
    if (entry == datastore_.end()) {
        throw ResourceException("id " + std::to_string(id) + " doesn't exist", Here());
    }
    return entry->second;
}
TRACED

Property& Properties::GetProperty(std::uint16_t id) try {
    const auto entry = Find(datastore_, id);
    if (entry == datastore_.end()) {
        throw ResourceException("id " + std::to_string(id) + " doesn't exist", Here());
    }
    return entry->second;
}
TRACED

void Properties::SetProperty(std::uint16_t id, const Property& value) try {
    if (const auto entry = Find(datastore_, id); entry != datastore_.end()) {
        entry->second = value;
    } else {
        datastore_.emplace_back(id, value);
    }
}
TRACED

std::list<std::uint16_t> Properties::GetPropertyKeys() const try {
    std::list<std::uint16_t> keys;
    for (const auto& entry : datastore_) {
        keys.push_back(entry.first);
    }
    return keys;
}
TRACED

std::size_t Properties::SizeOf(bool valuesOnly) const {
    std::size_t size = valuesOnly ? 0 : IdentifierSize * datastore_.size();
    for (const auto& entry : datastore_) {
        size += entry.second.SizeOf();
    }
    return size;
}

void Properties::Dump(std::vector<std::uint8_t>::iterator first, std::vector<std::uint8_t>::iterator last,
                      bool valuesOnly, bool bigEndian) const try {
    const std::size_t size = SizeOf(valuesOnly);
    if (size > static_cast<std::size_t>(last - first)) {
        throw ResourceException("Configuration data dump target too small", Here());
    }
    std::uint8_t* target = size == 0 ? nullptr : &*first;
    for (const auto& [id, value] : datastore_) {
        if (!valuesOnly) {
            EndianConversion::ShortToByteArray(id, target, bigEndian);
            target += IdentifierSize;
        }
        value.WriteBytes(target, bigEndian);
        target += value.SizeOf();
    }
}
TRACED

std::string Properties::GetExceptionText(std::uint16_t id) try {
    return "Requested data is not available (ID " + std::to_string(id) + ")";
}
TRACED

}  // namespace Varnholt::DeviceDriver::Generic::Configuration
