#pragma once

#include <cstdint>

#include "DeviceDriver/Generic/Configuration/Properties.h"
#include "DeviceDriver/Ostra/LowLevel/PellandoFunctionality.h"

namespace Varnholt::DeviceDriver::Ostra::LowLevel {

/// The instrument's volatile settings as property values: measurement parameters and MISC values. Times are
/// seconds; the instrument counts them in units of the time base, which each store of measurement parameters
/// chooses (see `SwitchToPerfectMode`), so that a load after it converts with the same one.
///
/// Failures of commands pass through. One thread at a time.
class PellandoRAM {
  public:
    using Property = Generic::Configuration::Property;
    using Properties = Generic::Configuration::Properties;

    /// No access to the instrument.
    explicit PellandoRAM(const Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionality>& instrument);
    PellandoRAM(const PellandoRAM&) = delete;
    PellandoRAM& operator=(const PellandoRAM&) = delete;
    virtual ~PellandoRAM() = default;

    /// The value of one identifier; one that no command loads comes back as its default.
    virtual Property Load(std::uint16_t id);
    /// Fills the set and answers it. An empty set named "PhysicalConditions" becomes
    /// `GetDefaultPhysicalConditons` first. A set with a MISC identifier gets all MISC values, one with a
    /// measure identifier all measurement parameters; a set with neither costs no command.
    virtual Properties& Load(Properties& set);
    /// A measure identifier needs the others in the same set, so storing it alone fails as the set does.
    virtual void Store(std::uint16_t id, const Property& value);
    /// A set without a measure identifier stores nothing. Otherwise it must hold 2013 (as loaded: it says
    /// whether the instrument has modes), 2009, 2001, 2010, 2008, 2000, 2002 and 2003; `ResourceException`
    /// "id N doesn't exist" for the first that is missing.
    virtual void Store(Properties& set);
    /// What the instrument said of the mode last chosen; false before the first store.
    virtual bool IsInPerfectMode() { return perfectMode_; }

    void LoadMiscParameters(Properties& set);
    void LoadMeasureParameters(Properties& set);
    void StoreMeasureParameters(Properties& set);
    /// Picks the first of the instrument's modes whose time base can count the integration time 2009, and
    /// switches to it: one with factor times unit <= time < 65535 times unit. An instrument whose 2013 is
    /// below 301 has one mode only. Fails with `ResourceException` "Integration time too high" or
    /// "Integration time too low", the instrument left in the last mode tried and the time base of
    /// construction in force; an instrument that never comes to its last mode counts as "too low" after 255
    /// tries.
    void SwitchToPerfectMode(const Properties& set);
    /// The time as the search compares it with the modes: the product of two floats, as a float, without its
    /// fraction. A whole number of microseconds may come out one less, as 0.000247 s do, which no float is:
    /// who needs the number exact hands down the float above.
    static std::uint32_t SearchedMicroseconds(float seconds);

    /// The template of a whole set, every element -1.
    static const Properties& GetDefaultPhysicalConditons();

  private:
    Varnholt::Utilities::Tools::SmartPointer<PellandoFunctionality> functionality_;
    bool perfectMode_ = false;
    float tickSeconds_;
    std::uint16_t coarseFactor_;  ///< time units in one unit of the second measurement time
};

}  // namespace Varnholt::DeviceDriver::Ostra::LowLevel
