#pragma once
// kest::ops::Document: a calibration tree as plain C++ values (std::string, std::vector,
// std::optional), converted from and to a KestCdfCalData. Everything the tree holds that the
// writer can tell apart is kept: a std::nullopt text is a null string (no element is written
// for it, or the writer refuses it), "" is an empty one.
//
// Strings are UTF-8; an unpaired UTF-16 surrogate in the tree becomes U+FFFD.
// Element kinds other than integer, double, text and empty, which only a host can put into a
// tree, are taken by value: small integer types as integers, VT_R4 as a double, anything else
// as its text.

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "../platform/Export.h"

#include "Value.h"

namespace kest {

class KestCdfCalData;

namespace ops {

/// A value list: the elements of a VALUE or AXIS. `present` false stands for a list the tree
/// holds no array for (VT_EMPTY), which the writer refuses; an array of no elements is present.
struct KEST_API ValueList {
    bool present = false;
    std::vector<Value> elements;
};

struct KEST_API Axis {
    /// The size attribute as written: a signed 32-bit number (the tree keeps its bits).
    std::int32_t size = 0;
    std::string units;
    std::string format;
    ValueList points;
};

struct KEST_API Item {
    std::optional<std::string> name;
    /// Units and format type of the item's value; both null when the item has no value object.
    std::optional<std::string> units;
    std::optional<std::string> format;
    ValueList values;
    std::vector<Axis> axes;
    std::optional<std::string> annotation;
    std::optional<std::string> note;
    /// False when the item has no value object (units and format are then null).
    bool HasValue() const noexcept { return units.has_value(); }
};

/// A SYMBOLIC-FILE or TARGET-IMAGE: a file name and the CRC-32 stored for it.
struct KEST_API FileRef {
    std::string name;
    std::uint32_t crc = 0;
};

struct KEST_API CalList {
    std::optional<std::string> name;
    std::optional<FileRef> symbolicFile;
    std::optional<FileRef> targetImage;
    std::optional<std::string> note;
    std::vector<Item> items;
};

struct KEST_API Change {
    std::string user;
    /// "YYYY-MM-DDThh:mm:ss".
    std::string date;
    std::optional<std::string> tool;
    std::optional<std::string> note;
    std::optional<std::string> dataVersion;
};

struct KEST_API Document {
    std::string ns;
    std::optional<std::string> schemaInstance;
    std::optional<std::string> schemaLocation;
    std::string fileName;
    std::optional<std::string> company;
    std::optional<std::string> note;
    std::vector<Change> history;
    std::vector<CalList> lists;

    /// Number of items over all lists.
    std::size_t ItemCount() const noexcept;
};

/// The document of a tree: lists, items, axes and change entries up to the counts the tree
/// keeps beside its arrays (what the writer writes); negative counts read as none.
KEST_API Document FromCalData(const KestCdfCalData& data);

/// A new tree holding the document. Dates go through KestCdfDate's checks: a date text it
/// refuses throws KestCalmorphDLLError with the date's reason code (34 to 40).
KEST_API KestCdfCalData ToCalData(const Document& document);

}  // namespace ops
}  // namespace kest
