#include "DeviceDriver/Generic/Configuration/Properties.h"

#include <algorithm>

#include "DeviceDriver/Generic/Utilities/EndianConversion.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Exceptions/Trace.h"
#include "Utilities/Tools/LexicalCast.h"

namespace Varnholt::DeviceDriver::Generic::Configuration {

namespace EndianConversion = Utilities::EndianConversion;
using Varnholt::Utilities::Exceptions::Here;
using Varnholt::Utilities::Exceptions::ResourceException;
using Varnholt::Utilities::Tools::lexical_cast;

namespace {

constexpr std::size_t IdentifierSize = 2;

template <class Store>
auto Find(Store& datastore, std::uint16_t id) {
    return std::find_if(datastore.begin(), datastore.end(),
                        [id](const auto& entry) { return entry.first == id; });
}

}  // namespace

Properties::Properties(const std::string& nameOfCollection) try : name(nameOfCollection) {}
TRACED

void Properties::SetName(const std::string& newName) try { name = newName; }
TRACED

bool Properties::Contains(std::uint16_t id) const {
    return Find(datastore, id) != datastore.end();
}

const Property& Properties::GetProperty(std::uint16_t id) const try {
    const auto entry = Find(datastore, id);
    if (entry == datastore.end()) {
        throw ResourceException("id " + lexical_cast<std::string>(id) + " doesn't exist", Here());
    }
    return entry->second;
}
TRACED

Property& Properties::GetProperty(std::uint16_t id) try {
    const auto entry = Find(datastore, id);
    if (entry == datastore.end()) {
        throw ResourceException("id " + lexical_cast<std::string>(id) + " doesn't exist", Here());
    }
    return entry->second;
}
TRACED

void Properties::SetProperty(std::uint16_t id, const Property& value) try {
    if (const auto entry = Find(datastore, id); entry != datastore.end()) {
        entry->second = value;
    } else {
        datastore.emplace_back(id, value);
    }
}
TRACED

std::list<std::uint16_t> Properties::GetPropertyKeys() const try {
    std::list<std::uint16_t> keys;
    for (const auto& entry : datastore) {
        keys.push_back(entry.first);
    }
    return keys;
}
TRACED

std::size_t Properties::SizeOf(bool valuesOnly) const {
    std::size_t size = valuesOnly ? 0 : IdentifierSize * datastore.size();
    for (const auto& entry : datastore) {
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
    for (const auto& [id, value] : datastore) {
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
    return "Requested data is not available (ID " + lexical_cast<std::string>(id) + ")";
}
TRACED

}  // namespace Varnholt::DeviceDriver::Generic::Configuration
