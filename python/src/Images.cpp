#include "Images.h"

#include <pybind11/numpy.h>

#include "Service/Failure.h"
#include "Service/Memory/ImageCheck.h"
#include "Service/Memory/ImageDiff.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Memory/ImageModel.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Values.h"

namespace Varnholt::Python {

namespace py = pybind11;
using namespace Service;
using DeviceDriver::Generic::Configuration::Properties;

namespace {

template <class Element>
py::object FromElements(const std::vector<Element>& elements, bool isScalar) {
    if (isScalar && elements.size() == 1) {
        return py::cast(elements.front());
    }
    return py::array_t<Element>(static_cast<py::ssize_t>(elements.size()), elements.data());
}

/// What `read` answers of an image; what the memory model refuses is bad data.
template <class Read>
auto Interpret(Read read) {
    try {
        return read();
    } catch (const Utilities::Exceptions::RuntimeException& exception) {
        throw Failure(FailureKind::BadData,
                      std::string("the driver cannot use the image: ") + exception.what(),
                      "check() tells what is wrong with it");
    }
}

py::object SideOf(const std::optional<Property>& value, bool isWord) {
    if (!value) {
        return py::none();
    }
    return isWord ? py::cast(static_cast<std::uint32_t>(value->AsLong())) : ObjectOf(*value);
}

py::list FindingsOf(const py::bytes& image) {
    py::list rows;
    for (const ImageFinding& finding : CheckImage(ImageFrom(image))) {
        rows.append(py::make_tuple(NameOf(finding.severity), finding.area, finding.text));
    }
    return rows;
}

py::tuple DiffOf(const py::bytes& a, const py::bytes& b) {
    const ImageDiff diff = Compare(ImageFrom(a), ImageFrom(b));
    py::list values, areas;
    for (const ImageDiff::Value& value : diff.values) {
        const bool isWord = value.kind == "word";
        values.append(py::make_tuple(value.kind, value.id, SideOf(value.a, isWord), SideOf(value.b, isWord)));
    }
    for (const ImageDiff::Area& area : diff.areas) {
        areas.append(py::make_tuple(area.name, area.first, area.last, area.different, area.firstDifference));
    }
    return py::make_tuple(values, areas, diff.unreadableA, diff.unreadableB);
}

py::tuple LogOf(const py::bytes& bytes) {
    return Interpret([&] {
        const EepromImage image = ImageFrom(bytes);
        ImageModel model(image);
        const LogCopies copies = ReadLogCopies(image);
        return py::make_tuple(DictOf(model.Log()), copies.Used(), copies.main.isValid, copies.second.isValid);
    });
}

}  // namespace

py::object ObjectOf(const Property& value) {
    using namespace DeviceDriver::Generic::Configuration;
    const bool isFloat = value.GetType() == TypeFloat || value.GetType() == TypeFloatVector;
    return isFloat ? FromElements(value.AsFloatVector(), value.GetType() == TypeFloat)
                   : FromElements(value.AsLongVector(), value.GetType() == TypeLong);
}

py::dict DictOf(const Properties& set) {
    py::dict values;
    for (const auto& [id, value] : set.GetDatastore()) {
        values[py::cast(id)] = ObjectOf(value);
    }
    return values;
}

std::vector<Assignment> AssignmentsFrom(const py::iterable& pairs) {
    std::vector<Assignment> assignments;
    for (const py::handle pair : pairs) {
        const auto [id, text] = pair.cast<std::pair<std::uint16_t, std::string>>();
        assignments.push_back({id, text});
    }
    return assignments;
}

void AddImageFunctions(py::module_& module) {
    module.def("fresh_image", [] { return BytesOf(FreshImage()); });
    module.def("check_image", FindingsOf);
    module.def("diff_images", DiffOf);
    module.def("image_log", LogOf);
    module.def("image_calibration", [](const py::bytes& image) {
        return Interpret([&] { return DictOf(ImageModel(ImageFrom(image)).Calibration()); });
    });
    module.def("image_table", [](const py::bytes& image) {
        return Interpret([&] { return DictOf(ImageModel(ImageFrom(image)).Table()); });
    });
    module.def("with_calibration", [](const py::bytes& image, const py::iterable& pairs) {
        return Interpret(
            [&] { return BytesOf(WithCalibration(ImageFrom(image), AssignmentsFrom(pairs)).image); });
    });
    module.def("with_empty_log", [](const py::bytes& image) {
        return Interpret([&] { return BytesOf(WithEmptyLog(ImageFrom(image))); });
    });
    module.def("binary_block",
               [](const py::bytes& image) { return BytesOf(BinaryBlockOf(ImageFrom(image))); });
    module.def("with_binary_block", [](const py::bytes& image, const py::bytes& block) {
        return BytesOf(WithBinaryBlock(ImageFrom(image), VectorOf(block)));
    });
    module.def("raw_word",
               [](const py::bytes& image, std::uint16_t id) { return RawWordOf(ImageFrom(image), id); });
    module.def("with_raw_word", [](const py::bytes& image, std::uint16_t id, std::uint32_t word) {
        EepromImage edited = ImageFrom(image);
        SetRawWord(edited, id, word);
        return BytesOf(edited);
    });
}

}  // namespace Varnholt::Python
