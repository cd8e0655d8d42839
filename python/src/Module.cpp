// The extension module ostra._core: what the package's Python code stands on. Instruments in, arrays and
// bytes out; names, units and documentation are the package's.
#include <pybind11/numpy.h>
#include <pybind11/pybind11.h>
#include <pybind11/stl.h>

#include <chrono>
#include <thread>

#include "Images.h"
#include "Instrument.h"
#include "ScanStream.h"
#include "Service/Instruments.h"
#include "Service/Memory/EepromAccess.h"
#include "Service/Memory/ImageCheck.h"
#include "Service/Memory/RamAccess.h"
#include "Service/Memory/RamParameters.h"
#include "Simulation.h"
#include "Utilities/Exceptions/Exceptions.h"
#include "Utilities/Files/AtomicFile.h"
#include "Utilities/Files/FileError.h"
#include "Values.h"

namespace Varnholt::Python {
namespace {

using namespace Service;
using Transport = Context::Transport;
using Commands = OpenedInstrument::Commands;

const char* NameOf(FailureKind kind) {
    switch (kind) {
        case FailureKind::BadArgument:
            return "BadArgument";
        case FailureKind::NotFound:
            return "NotFound";
        case FailureKind::Unplugged:
            return "Unplugged";
        case FailureKind::InUse:
            return "InUse";
        case FailureKind::NoPermission:
        case FailureKind::NoLock:
            return "NoPermission";
        case FailureKind::TransferFailed:
            return "TransferFailed";
        case FailureKind::ShortData:
            return "ShortData";
        case FailureKind::Timeout:
            return "Timeout";
        case FailureKind::BadData:
            return "BadData";
        case FailureKind::File:
            return "File";
        case FailureKind::Different:
        case FailureKind::Interrupted:
        case FailureKind::Other:
            break;
    }
    return "Other";
}

/// Becomes an exception of ostra.errors.
void Raise(const Failure& failure) {
    const py::object exception =
        py::module_::import("ostra.errors")
            .attr("_from_failure")(NameOf(failure.Kind()), failure.Message(), failure.Advice(),
                                   failure.Instrument(), failure.DriverText());
    PyErr_SetObject(reinterpret_cast<PyObject*>(Py_TYPE(exception.ptr())), exception.ptr());
}

void Translate(std::exception_ptr exception) {
    try {
        std::rethrow_exception(exception);
    } catch (const Failure& failure) {
        Raise(failure);
    } catch (const Utilities::Files::FileError&) {
        Raise(Describe(std::current_exception()));
    } catch (const Utilities::Exceptions::TraceableException&) {
        Raise(Describe(std::current_exception()));
    }
}

Transport TransportOf(const std::string& name) {
    if (name != "" && name != "native" && name != "usbio") {
        throw Failure(FailureKind::BadArgument, "'" + name + "' is no transport", "native or usbio");
    }
    return name.empty()      ? DeviceDriver::Ostra::HostTransport()
           : name == "usbio" ? Transport::UsbIo
                             : Transport::Native;
}

/// For looking at all instruments: a Ctrl-C ends the search, and no other work.
template <class Work>
auto WithAllInstruments(const std::string& transport, Work work) {
    Host::Instance().CheckUsable();
    Observer observer;
    Interruption interruption;
    Context context(observer, interruption, Host::Instance().Files());
    interruption.SetAction({});
    context.ChooseTransport(TransportOf(transport));
    try {
        const InterruptGuard guard(interruption);
        const Away away;
        return work(context);
    } catch (const Failure& failure) {
        if (failure.Kind() != FailureKind::Interrupted) {
            throw;
        }
    }
    RaiseInterrupt();
}

std::shared_ptr<Instrument> Open(const std::string& name, const std::string& transport) {
    const std::string identifier = WithAllInstruments(
        transport, [&](Context& context) { return FindInstrument(context, name).Identifier(); });
    return Make<Instrument>(identifier, TransportOf(transport));
}

py::list ListAll(const std::string& transport, bool withChipId) {
    struct Row {
        std::string identifier;
        ChipIdAnswer answer;
    };
    const auto rows = WithAllInstruments(transport, [&](Context& context) {
        std::vector<Row> found;
        for (const std::string& identifier : ListInstruments(context)) {
            found.push_back({identifier, withChipId ? AskChipId(context, identifier) : ChipIdAnswer{}});
        }
        return found;
    });
    py::list list;
    for (const Row& row : rows) {
        list.append(py::make_tuple(row.identifier, ShortNameOf(row.identifier), row.answer.chipId,
                                   row.answer.problem ? row.answer.problem->Message() : ""));
    }
    return list;
}

MeasurementSettings SettingsOf(double integrationTime, const py::object& parameters) {
    MeasurementSettings settings{integrationTime, {}};
    if (!parameters.is_none()) {
        const auto [p1, p2, p3, p4] =
            parameters.cast<std::tuple<std::uint16_t, std::uint16_t, std::uint16_t, std::uint8_t>>();
        settings.parameters = {p1, p2, p3, p4};
    }
    return settings;
}

py::dict Identify(Instrument& instrument) {
    const Identity found = instrument.Use([](OpenedInstrument& opened) { return opened.Identify(); });
    py::dict identity;
    identity["chip_id"] = found.chipId;
    identity["misc"] = py::make_tuple(found.misc1, found.misc2, found.misc3, found.misc4, found.misc5);
    identity["mode"] = py::tuple(py::cast(found.mode));
    identity["cpld"] = found.cpld;
    identity["parameters"] = py::make_tuple(found.p1, found.p2, found.p3, found.p4, found.p5);
    return identity;
}

py::dict LoadRam(Instrument& instrument) {
    return DictOf(instrument.Use([](OpenedInstrument& opened) {
        return opened.Do([](const Commands& commands) { return RamAccess(commands).Load(); });
    }));
}

py::dict StoreRam(Instrument& instrument, const py::iterable& pairs) {
    const std::vector<Assignment> assignments = AssignmentsFrom(pairs);
    return DictOf(instrument.Use([&](OpenedInstrument& opened) {
        return opened.Do([&](const Commands& commands) {
            RamAccess ram(commands);
            return ram.StoreAndLoad(WithParameters(ram.Load(), assignments));
        });
    }));
}

void SetMode(Instrument& instrument, std::uint8_t mode) {
    instrument.Use([mode](OpenedInstrument& opened) {
        opened.Do([mode](const Commands& commands) { commands->SetMeasureMode(mode); });
    });
}

/// Makes the EEPROM hold the image the safe way. Answers the pieces written and the backup's name.
py::tuple WriteSafely(Instrument& instrument, const py::bytes& bytes, bool wholePieces, bool withBackup,
                      const std::string& backupFile) {
    const EepromImage wanted = ImageFrom(bytes);
    const WrittenChange change = instrument.Use([&](OpenedInstrument& opened) {
        const EepromImage present = ReadEepromTwice(opened);
        const auto keep = [&] { return withBackup ? SaveBackup(opened, present, backupFile) : ""; };
        const auto wayBack = [](const std::string& kept) {
            return kept.empty() ? "the same once more writes what is missing; there is no backup"
                                : "this brings back what was there before: eeprom.restore(\"" + kept + "\")";
        };
        return ChangeEeprom(opened, present, wanted,
                            wholePieces ? Granularity::Pieces : Granularity::Elements, {keep, wayBack});
    });
    return py::make_tuple(change.pieces, change.kept);
}

void AddInstrument(py::module_& module) {
    py::class_<ScanStream, std::shared_ptr<ScanStream>>(module, "ScanStream")
        .def("next", &ScanStream::Next)
        .def("close", &ScanStream::Close)
        .def("is_running", &ScanStream::IsRunning)
        .def("received", &ScanStream::Received)
        .def("seconds", &ScanStream::Seconds)
        .def("left_over", &ScanStream::LeftOver);
    py::class_<EventStream, std::shared_ptr<EventStream>>(module, "EventStream")
        .def("next", &EventStream::Next, py::arg("timeout"))
        .def("is_open", &EventStream::IsOpen);
    py::class_<Instrument, std::shared_ptr<Instrument>>(module, "Instrument")
        .def(py::init(&Open), py::arg("name"), py::arg("transport"))
        .def_property_readonly("identifier", &Instrument::Identifier)
        .def("is_open", &Instrument::IsOpen)
        .def("close", &Instrument::Close)
        .def("resets", &Instrument::Resets)
        .def(
            "prepare",
            [](Instrument& instrument, double integrationTime, const py::object& parameters) {
                const MeasurementSettings settings = SettingsOf(integrationTime, parameters);
                instrument.Prepare(settings);
                const MeasurementFacts facts = instrument.Facts(settings);
                const MeasurementParameters& p = facts.parameters;
                return py::make_tuple(py::make_tuple(p.p1, p.p2, p.p3, p.p4), facts.integrationTime);
            },
            py::arg("integration_time"), py::arg("parameters"))
        .def("readout", &Instrument::Readout)
        .def("identify", Identify)
        .def("chip_id",
             [](Instrument& instrument) {
                 return instrument.Use([](OpenedInstrument& opened) { return opened.ChipId(); });
             })
        .def(
            "reset",
            [](Instrument& instrument, std::uint16_t code) {
                instrument.Use([code](OpenedInstrument& opened) { opened.Reset(code); });
            },
            py::arg("code"))
        .def("set_mode", SetMode, py::arg("mode"))
        .def("load_ram", LoadRam)
        .def("store_ram", StoreRam, py::arg("values"))
        .def("read_eeprom", [](Instrument& instrument) { return BytesOf(instrument.Use(ReadEepromTwice)); })
        .def("write_eeprom", WriteSafely, py::arg("image"), py::arg("whole_pieces"), py::arg("with_backup"),
             py::arg("backup_file"))
        .def("scan", &Instrument::Scan, py::arg("record_size"), py::arg("total"), py::arg("timeout"),
             py::arg("as_bytes"))
        .def("stop_scan", &Instrument::StopScan)
        .def("events", &Instrument::Events);
}

}  // namespace

PYBIND11_MODULE(_core, module) {
    py::register_exception_translator(Translate);
    module.attr("__version__") = OSTRA_VERSION;
    module.attr("longest_record") = LongestScanRecord;
    module.def("list_instruments", ListAll, py::arg("transport"), py::arg("with_chip_id"));
    module.def("default_transport",
               [] { return DeviceDriver::Ostra::HostTransport() == Transport::UsbIo ? "usbio" : "native"; });
    module.def("is_time_virtual", [] { return Host::Instance().IsTimeVirtual(); });
    module.def("start_capture", [](const std::string& file) { Host::Instance().StartCapture(file); });
    module.def("end_capture", [] { Host::Instance().EndCapture(); });
    module.def("wait_for_threads", [](double seconds) {
        const Away away;
        constexpr std::uint32_t interval = 2;  // milliseconds
        for (double waited = 0; Away::Count() > 1 && waited < seconds; waited += interval / 1e3) {
            std::this_thread::sleep_for(std::chrono::milliseconds(interval));
        }
    });
    module.def("parameter_meaning", MeaningOfParameter);
    module.def("save_file", [](const std::string& file, const py::bytes& content, bool replace) {
        using Utilities::Files::AtomicFile;
        Utilities::Files::WriteFileAtomically(
            file, VectorOf(content),
            replace ? AtomicFile::IfItExists::Replace : AtomicFile::IfItExists::Refuse);
    });
    module.def("errors_of_image",
               [](const py::bytes& image) { return ErrorsOf(CheckImage(ImageFrom(image))); });
    AddImageFunctions(module);
    AddInstrument(module);
    AddSimulation(module);
}

}  // namespace Varnholt::Python
