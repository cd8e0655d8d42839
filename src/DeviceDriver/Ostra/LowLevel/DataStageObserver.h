#pragma once

#include <cstdint>

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// Told of the data of each command: how many bytes it asked to move, either way, and how many did.
class DataStageObserver {
  public:
    virtual ~DataStageObserver() = default;

    /// On the thread of the command, once for each of its data stages that succeeded; not for those of a
    /// scan. What it throws ends the command.
    virtual void DataStageEnded(std::uint32_t asked, std::uint32_t moved) = 0;
};

/// Takes a command whose data did not move as a whole for a failure: `IOException` "M of N bytes came", with
/// the numbers as its `MissingData`. For whoever relies on what was read: a transport may call a read that
/// brought less than it should a success, and leave the rest as it was.
class WholeDataStages final : public DataStageObserver {
  public:
    void DataStageEnded(std::uint32_t asked, std::uint32_t moved) override;
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
