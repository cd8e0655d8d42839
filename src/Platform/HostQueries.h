#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace Varnholt::Platform {

/// The platform's record of its own version. On a platform other than Windows: a record of no family of
/// Windows, which leads to a truthful text (see the implementation).
struct VersionRecord {
    std::uint32_t platformId = 0;
    std::uint32_t major = 0;
    std::uint32_t minor = 0;
    std::uint32_t build = 0;
    std::string servicePack;
};
VersionRecord ReadVersionRecord();
/// The same, whatever tests have put in its place.
VersionRecord ReadSystemVersion();

/// Asks whether this process runs as a 32-bit process on a 64-bit host; sets `flag` non-zero when it does.
using Is64BitHostQuery = bool (*)(int& flag);

/// The host's query, or null where the host does not offer it.
Is64BitHostQuery LookUp64BitHostQuery();

/// Tests replace what the two questions above answer; `nullopt` gives the answer back to the host.
void OverrideVersionRecord(std::optional<VersionRecord> record);
/// Wins over the query inside `Is64BitOS` (Utilities/Tools); the query's own entry point is left alone.
void Override64BitHost(std::optional<bool> answer);
std::optional<bool> Overridden64BitHost();

}  // namespace Varnholt::Platform
