#pragma once

#include <pybind11/pybind11.h>

#include "DeviceDriver/Generic/Configuration/Properties.h"
#include "Service/Memory/PropertyText.h"

namespace Varnholt::Python {

/// An int or a float where the value has one element of that type, an array otherwise.
pybind11::object ObjectOf(const Service::Property& value);
/// By identifier, in the order of the set.
pybind11::dict DictOf(const DeviceDriver::Generic::Configuration::Properties& set);
/// From pairs of an identifier and a text.
std::vector<Service::Assignment> AssignmentsFrom(const pybind11::iterable& pairs);

/// What can be done with images alone, which are bytes here.
void AddImageFunctions(pybind11::module_& module);

}  // namespace Varnholt::Python
