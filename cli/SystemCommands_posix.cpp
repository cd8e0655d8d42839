#include "Commands/Commands.h"
#include "Output/Table.h"
#include "Platform/Usb/UdevBus.h"
#include "Session.h"
#include "SystemCommands.h"

namespace Varnholt::Cli {

void AddSystemCommands(CLI::App& app, Session& session) {
    AddRegister(app, session);
    AddDoctor(app, session);
}

void PrintCandidates(Session& session, bool json) {
    Json list = Json::array();
    Table table({{"NAME"}, {"VID:PID"}, {"REGISTERED"}, {"DEVICE"}});
    for (const auto& device : Platform::Usb::ListCandidateDevices()) {
        const std::string id = device.vendorId + ":" + device.productId;
        const std::string text =
            device.manufacturer + (device.manufacturer.empty() ? "" : " ") + device.product;
        list.push_back({{"name", device.name},
                        {"id", id},
                        {"registered", device.registered},
                        {"device", text},
                        {"serial", device.serial},
                        {"node", device.deviceNode}});
        table.AddRow({device.name, id, device.registered ? "yes" : "no", text});
    }
    if (json) {
        session.Print({{"candidates", list}});
    } else if (table.IsEmpty()) {
        session.Note("no USB device with the instrument's endpoints is plugged in");
    } else {
        table.Print(session.Out());
    }
}

}  // namespace Varnholt::Cli
