#pragma once

#include <string>

#include "Platform/HostQueries.h"

/// On which operating system the library runs. Any thread may ask; the version record is read anew each time.
namespace Varnholt::Utilities::Tools {

/// Decides the transport: true selects USBIO, false the instrument's own driver. True when the host says that
/// this process runs as a 32-bit process on a 64-bit host; see `Platform::Override64BitHost`.
bool Is64BitOS();
/// The same of a given query: false where there is none; the query's own success is not examined.
bool Is64BitOS(Platform::Is64BitHostQuery isWow64Process);

/// The edition, for example "XP".
std::string GetOSName();
/// Service pack and build, for example "Service Pack 3 (Build 2600)"; begins with a blank without a service
/// pack.
std::string GetServicePack();
/// Major and minor version, for example "5.1".
std::string GetOSVersion();
std::string GetOSDescription();

}  // namespace Varnholt::Utilities::Tools
