#include <gtest/gtest.h>

#include <algorithm>
#include <tuple>

#include "DeviceDriver/Generic/Utilities/DriverExceptions.h"
#include "Protocol/ByteOrder.h"
#include "Protocol/EepromMap.h"
#include "Service/Failure.h"
#include "Service/Memory/EepromAccess.h"
#include "Service/Memory/ImageCheck.h"
#include "Service/Memory/ImageDiff.h"
#include "Service/Memory/ImageEdit.h"
#include "Service/Memory/ImageModel.h"
#include "Service/Memory/ImageTransport.h"
#include "Service/Memory/PropertyText.h"
#include "Support/Bytes.h"

namespace Varnholt::Tests {
namespace {

using namespace Service;
namespace Map = Protocol::EepromMap;

/// A fresh image with something in every area.
EepromImage UsedImage() {
    EepromImage image = FreshImage();
    image = WithCalibration(image, {{1211, "77"}, {1000, "0.5,-2"}}).image;
    image = WithBinaryBlock(image, CountingImage(3, Map::BinarySize));
    SetRawWord(image, 10203, 0x01020304);
    image[8000] = 0x42;
    return image;
}

using Patch = std::pair<std::uint32_t, EepromImage>;

/// An entry of the table.
Patch Entry(std::uint32_t index, std::uint16_t id, std::uint32_t address) {
    EepromImage bytes(6);
    Protocol::StoreBig16(&bytes[0], id);
    Protocol::StoreBig32(&bytes[2], address);
    return {Map::Table + 4 + 6 * index, bytes};
}

/// A fresh image with these bytes.
EepromImage Patched(const std::vector<Patch>& patches) {
    EepromImage image = FreshImage();
    for (const auto& [address, bytes] : patches) {
        std::ranges::copy(bytes, image.data() + address);
    }
    return image;
}

/// Addresses at which two images differ.
std::vector<std::uint32_t> Differences(const EepromImage& a, const EepromImage& b) {
    std::vector<std::uint32_t> addresses(a.size());
    std::iota(addresses.begin(), addresses.end(), 0U);
    std::erase_if(addresses, [&](std::uint32_t at) { return a[at] == b[at]; });
    return addresses;
}

/// What is said and advised.
template <class Function>
std::string FailureOf(Function function, FailureKind kind = FailureKind::BadArgument) {
    try {
        function();
    } catch (const Failure& failure) {
        EXPECT_EQ(failure.Kind(), kind) << failure.what();
        return failure.what() + ("\n" + failure.Advice());
    }
    ADD_FAILURE() << "no failure";
    return {};
}

TEST(ImageTransportTest, ReachesNothingOutsideTheImage) {
    EepromImage image(8192, 7);
    ImageTransport transport(image);
    std::vector<std::uint8_t> buffer(9000);
    for (const auto& [start, count, isInside] : {std::tuple(0U, 8192U, true),
                                                 {8191U, 1U, true},
                                                 {8192U, 0U, true},
                                                 {8191U, 2U, false},
                                                 {8193U, 0U, false},
                                                 {0xFFFFFFFFU, 2U, false},
                                                 {0U, 8193U, false}}) {
        DeviceDriver::Ostra::LowLevel::Bytes4 address;
        Protocol::StoreBig32(address.data(), start);
        const auto reaches = [&, count = count](auto function) {
            try {
                (transport.*function)(address, {}, buffer.data(), count);
                return true;
            } catch (const DeviceDriver::Generic::Utilities::IOException&) {
                return false;
            }
        };
        EXPECT_EQ(reaches(&ImageTransport::ReadEEPROM), isInside) << start;
        EXPECT_EQ(reaches(&ImageTransport::WriteEEPROM), isInside) << start;
    }
}

TEST(PropertyTextTest, AssignmentsKeepTypeAndNumberOfElements) {
    const Property oneLong(std::int32_t{0});
    const Property twoFloats(std::vector<float>{0, 0});
    for (const auto& [text, pattern, result] : std::vector<std::tuple<const char*, Property, const char*>>{
             {"1=5", oneLong, "5"},
             {"1=-2147483648", oneLong, "-2147483648"},
             {"1=2147483647", oneLong, "2147483647"},
             {"1=0xFFFFFFFF", oneLong, "-1"},
             {"0x3E8=0x10", oneLong, "16"},
             {"65535=0.1, -1e-3", twoFloats, "0.1, -0.001"},
             {"1= 3 ,4 ", twoFloats, "3, 4"},
             {"1=010", oneLong, "10"},
             {"1=1,2,3", Property(std::vector<float>(3)), "1, 2, 3"},
         }) {
        EXPECT_EQ(TextOf(ParseValue(ParseAssignment(text), pattern)), result) << text;
    }
    for (const char* text : {"", "1", "=5", "1=", "x=5", "65536=5", "-1=5", "1 =5"}) {
        EXPECT_EQ(FailureOf([text] { ParseAssignment(text); }),
                  "'" + std::string(text) +
                      "' is no ID=VALUE\nfor example 1211=5, or 1000=0.5,1.5 for a value of two elements");
    }
    const auto refusal = [](const char* text, const Property& pattern) {
        return FailureOf([&] { ParseValue(ParseAssignment(text), pattern); });
    };
    EXPECT_EQ(refusal("1=5,6", oneLong), "1 has 1 element, not 2\nelements are separated by commas");
    EXPECT_EQ(refusal("1=5", twoFloats), "1 has 2 elements, not 1\nelements are separated by commas");
    EXPECT_EQ(refusal("1=1,2,,", twoFloats), "1 has 2 elements, not 4\nelements are separated by commas");
    for (const std::string part :
         {"2147483648", "-2147483649", "5x", "1.5", "0x", "--5", "0x100000000", "", "1 5"}) {
        EXPECT_EQ(refusal(("1= " + part).c_str(), oneLong),
                  "1= " + part + ": '" + part + "' is no 32-bit integer\n");
    }
    for (const std::string part : {"nan", "inf", "1e39", "1;2", ""}) {
        EXPECT_EQ(refusal(("1=1," + part).c_str(), twoFloats),
                  "1=1," + part + ": '" + part + "' is no number that a 32-bit float holds\n");
    }
    EXPECT_TRUE(IsLongVector(Property(std::vector<std::int32_t>(16))));
    EXPECT_FALSE(IsLongVector(Property(std::vector<std::int32_t>(15))));
}

TEST(ImageEditTest, CalibrationLeavesADamagedLogAlone) {
    EepromImage before = UsedImage();
    before[9] ^= 1;  // main copy
    EXPECT_EQ(Differences(before, WithCalibration(before, {{1211, "78"}}).image),
              std::vector<std::uint32_t>{4711});
    before[2048 + 9] ^= 2;  // and the other
    EXPECT_EQ(Differences(before, WithCalibration(before, {{1211, "78"}}).image),
              std::vector<std::uint32_t>{4711});
}

TEST(ImageEditTest, RefusesWhatItCannotProve) {
    const EepromImage image = UsedImage();
    EXPECT_EQ(FailureOf([&] {
                  WithCalibration(image, {{10002, "5"}});
              }),
              "10002 is no calibration value\n`ostra calibration show` lists them");
    FailureOf([&] { WithCalibration(image, {{1206, "5"}}); });
    FailureOf([&] { WithCalibration(image, {{1000, "5"}}); });
    for (const auto& [size, given] : {std::pair(1903U, "1903"), {1905U, "more than 1904"}}) {
        EXPECT_EQ(
            FailureOf([&, size = size] { WithBinaryBlock(image, EepromImage(size)); }, FailureKind::BadData),
            std::string("the binary block has 1904 bytes, not ") + given + "\n");
    }
    EXPECT_EQ(FailureOf([&] { RawWordOf(image, 10240); }),
              "10240 is no raw word\nraw words are 10200 to 10239");
    EXPECT_EQ(FailureOf([&] { RawWordOf(image, 10199); }),
              "10199 is no raw word\nraw words are 10200 to 10239");
    // The table says that something lies elsewhere than the driver writes it; a log is empty here and there,
    // so that nobody would notice.
    const auto moved = [&image](std::uint32_t start, std::uint32_t end, std::uint32_t target) {
        EepromImage elsewhere = image;
        for (std::uint32_t at = Map::Table + 4; at + 6 <= Map::Table + 334; at += 6) {
            const std::uint32_t address = Protocol::LoadBig32(&elsewhere[at + 2]);
            if (address >= start && address < end) {
                Protocol::StoreBig32(&elsewhere[at + 2], address - start + target);
            }
        }
        std::copy_n(image.data() + start, 1064, elsewhere.data() + target);
        return elsewhere;
    };
    const EepromImage calibration = moved(Map::Calibration, 8192, 6000);
    ASSERT_EQ(ImageModel(calibration).Get().GetProperty(1211).AsLong(), 77);
    // Even the value that is there would be written in a place that is not the calibration's.
    FailureOf([&] { WithCalibration(calibration, {{1211, "77"}}); }, FailureKind::BadData);
    for (const std::uint32_t copy : {0U, 2048U}) {
        FailureOf([&] { WithEmptyLog(moved(copy, copy + 2048, 5000)); }, FailureKind::BadData);
    }
    // Or the table has one value in the place of others, which would change with it.
    EepromImage longLog = Patched({Entry(11, 10021, 4752), Entry(12, 1, 4756)});
    Protocol::StoreBig32(longLog.data(), ReadLogCopies(longLog).main.calculated);
    FailureOf([&] { WithCalibration(longLog, {{1211, "5"}}); }, FailureKind::BadData);
    FailureOf([] { WithEmptyLog(Patched({Entry(26, 1000, 0), {20, {1}}})); }, FailureKind::BadData);
    EepromImage corrupt = image;
    corrupt[Map::Table + 1] = 2;
    EXPECT_THROW(WithCalibration(corrupt, {{1211, "5"}}), DeviceDriver::Generic::Utilities::DataException);
    EXPECT_THROW(WithEmptyLog(corrupt), DeviceDriver::Generic::Utilities::DataException);
}

std::string Lines(const std::vector<ImageFinding>& findings) {
    std::string text;
    for (const ImageFinding& finding : findings) {
        text += std::string(NameOf(finding.severity)) + " " + finding.area + ": " + finding.text + "\n";
    }
    return text;
}

TEST(ImageCheckTest, AFreshImage) {
    EXPECT_EQ(Lines(CheckImage(FreshImage())),
              "ok table: version 1, 334 bytes\n"
              "ok table: 55 entries\n"
              "ok log: main copy: checksum 0x00000000\n"
              "ok log: second copy: checksum 0x00000000\n"
              "ok log: the driver uses the main copy\n"
              "ok calibration: 28 values\n"
              "note calibration: 28 values are -1, as in a fresh instrument\n"
              "ok binary block: empty\n"
              "ok raw words: empty\n");
    EXPECT_TRUE(IsSane(CheckImage(UsedImage())));
}

/// Entries that nobody knows behind the others, and as long a table as there can be.
std::vector<Patch> Unknown(std::uint32_t count) {
    std::vector<Patch> patches{{4098, {2, 0}}};
    for (std::uint32_t i = 0; i < count; ++i) {
        patches.push_back(Entry(55 + i, static_cast<std::uint16_t>(100 + i), 0));
    }
    return patches;
}

/// An image with errors, and with nothing else, is not sane.
TEST(ImageCheckTest, FindsWhatIsWrong) {
    const EepromImage erased(8192, 0xFF), noFloat(4, 0xFF);
    for (const auto& [patches, finding] : std::vector<std::pair<std::vector<Patch>, std::string>>{
             {{{0, erased}}, "error table: version 65535 instead of 1: the driver refuses the image"},
             {{{4098, {1, 43}}},
              "error table: length 299 instead of 300 to 512: the driver refuses the image"},
             {{{4098, {1, 44}}}, "error table: the driver refuses the image: id 3009 doesn't exist"},
             {{{4098, {1, 44}}}, "error table: values that end outside the image: 3009"},
             {{{4098, {2, 1}}},
              "error table: length 513 instead of 300 to 512: the driver refuses the image"},
             {Unknown(7),
              "warning table: 21 entries repeat an identifier\nwarning table: unknown identifiers: 100, 101, "
              "102, 103, 104, 105, 106, 65535"},
             {Unknown(8),
              "warning table: unknown identifiers: 100, 101, 102, 103, 104, 105, 106, 107 and 1 more"},
             {{{4098, {1, 79}}, Entry(55, 2, 4756)},
              "warning table: the length does not end with an entry\nok table: 55 entries\nwarning table: 1 "
              "entries repeat an identifier"},
             {{{11, {1}}}, "warning log: main copy: checksum 0x00000000 instead of 0x00000001"},
             {{{11, {1}}}, "ok log: the driver uses the second copy"},
             {{{11, {1}}, {2059, {1}}}, "error log: the driver uses an empty log"},
             {{{2051, {1}}, {2059, {1}}}, "note log: the two copies hold different values"},
             {{Entry(0, 10000, 0x80000000), Entry(1, 10001, 0x80000004)},
              "error table: values that end outside the image: 10000, 10001"},
             {{Entry(54, 2, 8192)},
              "ok table: 55 entries\nwarning table: values of another size than usual: 3013"},
             {{Entry(54, 2, 8193)}, "error table: values that end outside the image: 3013"},
             {{Entry(13, 11000, 100)}, "error table: 10010 and 11000 overlap"},
             {{Entry(26, 1000, 4094)}, "error table: 1000 and the table overlap"},
             {{Entry(26, 1000, 4200), Entry(27, 1001, 4200)},
              "warning table: values of another size than usual: 1000, 1001\nerror table: the table and 1001 "
              "overlap"},
             {{Entry(53, 3013, 4200), Entry(54, 2, 4200)},
              "warning table: values of another size than usual: 3013\nerror table: the driver refuses the "
              "image: corrupt EAT detected!!"},  // what is empty lies over nothing
             {{Entry(27, 1999, 4616)},
              "warning table: unknown identifiers: 1999\nwarning table: the calibration lacks 1001"},
             {{Entry(0, 1999, 0)},
              "warning table: the log lacks 10000\nerror table: the driver refuses the image: id 10000 "
              "doesn't exist"},
             {{Entry(13, 1999, 2048)}, "warning table: the second copy of the log lacks 10000"},
             {{Entry(13, 1999, 2048)}, "warning log: second copy: the table does not hold it"},
             {{Entry(11, 10021, 1061)}, "error log: the table has it elsewhere than the driver writes it"},
             {{Entry(25, 3, 3116)},
              "warning log: the table has the second copy elsewhere than the driver writes it"},
             {{Entry(12, 1, 2048), {1064, EepromImage(984)}},
              "warning log: it reaches into the binary block"},
             {{Entry(12, 1, 2052), {1064, EepromImage(988)}}, "error log: it reaches into the binary block"},
             {{Entry(29, 1206, 4632)},
              "warning table: calibration values cannot be changed: the table has them elsewhere than the "
              "driver writes them"},
             {{{4608, noFloat}}, "warning calibration: values that are no numbers: 1000"},
             {{{4608, EepromImage(144)}}, "note calibration: 1 values are -1, as in a fresh instrument"},
             {{{4608, EepromImage(148)}}, "ok calibration: 28 values\nok binary block: empty"},
             {{{1064, {0}}, {4031, {0}}}, "ok binary block: 2 of 1904 bytes used"},
             {{{4032, {0}}, {4035, {0}}, {4095, {0}}}, "ok raw words: 2 of 16 used"},
             {{{4756, {0}}}, "note rest: 1 bytes behind the calibration data are used"},
         }) {
        const std::vector<ImageFinding> findings = CheckImage(Patched(patches));
        const std::string text = Lines(findings);
        EXPECT_NE(("\n" + text).find("\n" + finding + "\n"), std::string::npos) << finding << " is not in:\n"
                                                                                << text;
        EXPECT_EQ(IsSane(findings), text.find("error") == std::string::npos) << text;
    }
}

/// The values and the areas that differ.
std::string Text(const ImageDiff& diff) {
    std::string text;
    const auto textOf = [](const std::optional<Property>& value) { return value ? TextOf(*value) : "none"; };
    for (const auto& value : diff.values) {
        text += value.kind + " " + std::to_string(value.id) + ": " + textOf(value.a) + " -> " +
                textOf(value.b) + "\n";
    }
    for (const ImageDiff::Area& area : diff.areas) {
        text += area.name + " " + std::to_string(area.first) + "-" + std::to_string(area.last) + ": " +
                std::to_string(area.different) + " from " + std::to_string(area.firstDifference) + "\n";
    }
    return text;
}

TEST(ImageDiffTest, ByValueThenByArea) {
    const EepromImage a = UsedImage();
    EXPECT_EQ(Text(Compare(a, a)), "");
    EepromImage b = WithCalibration(a, {{1211, "78"}}).image;
    SetRawWord(b, 10215, 1);
    b[3] = b[11] = 1;  // in the log, with its checksum
    b[1064] ^= 0xFF;
    b[3200] ^= 0xFF;
    b[3201] ^= 0xFF;
    b[8191] = 0;
    EXPECT_EQ(Text(Compare(a, b)),
              "calibration 1211: 77 -> 78\n"
              "log 10000: 0 -> 1\n"
              "log 10002: 0 -> 1\n"
              "word 10215: -1 -> 1\n"
              "log, main copy 0-1063: 2 from 3\n"
              "binary block, first part 1064-2047: 1 from 1064\n"
              "binary block, second part 3112-4031: 2 from 3200\n"
              "raw words 4032-4095: 4 from 4092\n"
              "calibration 4608-4755: 1 from 4711\n"
              "rest 4756-8191: 1 from 8191\n");
    EXPECT_EQ(Text(Compare(FreshImage(), Patched({Entry(27, 1999, 4616)}))),
              "calibration 1001: -1, -1 -> none\n"
              "table 1001: 4616 -> none\n"
              "table 1999: none -> 4616\n"
              "allocation table 4096-4607: 2 from 4262\n");

    EepromImage unreadable = a;
    unreadable[Map::Table] = 9;
    const ImageDiff byArea = Compare(a, unreadable);
    EXPECT_EQ(byArea.unreadableA + byArea.unreadableB, "corrupt EAT detected!!");
    EXPECT_EQ(Text(byArea), "allocation table 4096-4607: 1 from 4096\n");
}

TEST(WritePiecesTest, OnlyWhatDiffersInPiecesOfAtMost256Bytes) {
    const EepromImage a(8192, 1);
    EepromImage b = a;
    const auto text = [&](Granularity granularity) {
        std::string pieces;
        for (const WritePiece& piece : PiecesToWrite(a, b, granularity)) {
            pieces += std::to_string(piece.address) + "+" + std::to_string(piece.length) + " ";
        }
        return pieces;
    };
    EXPECT_EQ(text(Granularity::Pieces), "");
    b[5] = b[11] = b[8191] = 0;
    EXPECT_EQ(text(Granularity::Pieces), "0+256 7936+256 ");
    EXPECT_EQ(text(Granularity::Elements), "4+8 8188+4 ");
    std::fill(b.begin() + 1000, b.begin() + 1600, std::uint8_t{0});
    EXPECT_EQ(text(Granularity::Elements), "4+8 1000+256 1256+256 1512+88 8188+4 ");
}

}  // namespace
}  // namespace Varnholt::Tests
