#include "InfoOutput.h"

#include <algorithm>
#include <cstdio>

namespace kest::tool {

namespace {

// One line per field: control characters are shown escaped.
std::string Printable(const std::string& text) {
    std::string out;
    out.reserve(text.size());
    for (char c : text) {
        if (c == '\n') {
            out += "\\n";
        } else if (c == '\r') {
            out += "\\r";
        } else if (c == '\t') {
            out += "\\t";
        } else {
            out += c;
        }
    }
    return out;
}

std::string Show(const CComBSTR& text) {
    if (text == nullptr) return "(none)";
    return Printable(text.ToString());
}

std::string Show(const KestCdfNormalizedString& text) { return Show(text.m_string); }

std::string Hex32(int value) {
    char buffer[16];
    std::snprintf(buffer, sizeof buffer, "0x%08X", static_cast<unsigned int>(value));
    return buffer;
}

long CountValues(const _variant_t& value) {
    if (value.vt == VT_EMPTY) return 0;
    if ((value.vt & VT_ARRAY) != 0 && value.parray) {
        LONG lower = 0;
        LONG upper = -1;
        if (FAILED(SafeArrayGetLBound(value.parray, 1, &lower)) ||
            FAILED(SafeArrayGetUBound(value.parray, 1, &upper))) {
            return 0;
        }
        return static_cast<long>(upper) - lower + 1;
    }
    return 1;
}

void PrintItem(const KestCdfCalItem& item) {
    std::printf("      item %s\n", Show(item.GetName()).c_str());
    try {
        KestCdfCalItemValue value = item.GetCalItemValue();
        std::printf("        units: %s, format: %s, values: %ld\n", Show(value.GetUnits()).c_str(),
                    Show(value.GetFormatType()).c_str(), CountValues(value.GetValue()));
    } catch (const _com_error&) {
        std::printf("        value: (none)\n");
    }
    int axisCount = item.GetAxisSize();
    const KestCdfAxis* axes = item.GetAxis();
    if (axisCount > 0 && axes) {
        std::printf("        axes:");
        for (int i = 0; i < axisCount; ++i) {
            std::printf("%s %u", i ? "," : "", axes[i].GetSize());
        }
        std::printf("\n");
    } else {
        std::printf("        axes: none\n");
    }
}

}  // namespace

void PrintInfo(const std::string& file, const KestCdfCalData& data, bool withItems) {
    std::printf("file: %s\n", file.c_str());
    std::printf("namespace: %s\n", Show(data.GetNamespace()).c_str());
    std::printf("schema instance: %s\n", Show(data.GetSchemaInstance()).c_str());
    std::printf("schema location: %s\n", Show(data.GetSchemaLocation()).c_str());
    std::printf("file name: %s\n", Show(data.GetFileName()).c_str());
    std::printf("company: %s\n", Show(data.GetCompany()).c_str());
    std::printf("note: %s\n", Show(data.GetNote()).c_str());

    KestCdfChangeHistory history = data.GetChangeHistory();
    int changeCount = std::max(history.GetChangeArraySize(), 0);
    const KestCdfChange* changes = history.GetChange();
    if (!changes) changeCount = 0;
    std::printf("changes: %d\n", changeCount);
    for (int i = 0; i < changeCount; ++i) {
        const KestCdfChange& change = changes[i];
        std::printf("  change %d: %s by %s\n", i + 1,
                    change.GetDate().CreateTimeString().ToString().c_str(),
                    Show(change.GetUserNameW()).c_str());
        std::printf("    tool: %s, data version: %s\n", Show(change.GetTool()).c_str(),
                    Show(change.GetDataVersion()).c_str());
        std::printf("    note: %s\n", Show(change.GetNote()).c_str());
    }

    int listCount = std::max(data.GetCalListSize(), 0);
    const KestCdfCalList* lists = data.GetCalLists();
    if (!lists) listCount = 0;
    std::printf("lists: %d\n", listCount);
    for (int i = 0; i < listCount; ++i) {
        const KestCdfCalList& list = lists[i];
        std::printf("  list %d: %s\n", i + 1, Show(list.GetName()).c_str());
        try {
            KestCdfSymbolicFile symbolic = list.GetSymbolicFile();
            std::printf("    symbolic file: %s (crc32 %s)\n",
                        Show(symbolic.GetSymbolicFile()).c_str(), Hex32(symbolic.GetCrc()).c_str());
        } catch (const _com_error&) {
            std::printf("    symbolic file: (none)\n");
        }
        try {
            KestCdfTargetImage image = list.GetTargetImage();
            std::printf("    target image: %s (crc32 %s)\n", Show(image.GetTargetImage()).c_str(),
                        Hex32(image.GetCrc()).c_str());
        } catch (const _com_error&) {
            std::printf("    target image: (none)\n");
        }
        std::printf("    note: %s\n", Show(list.GetNote()).c_str());
        int itemCount = std::max(list.GetCalItemSize(), 0);
        const KestCdfCalItem* items = list.GetCalItems();
        if (!items) itemCount = 0;
        std::printf("    items: %d\n", itemCount);
        if (withItems) {
            for (int j = 0; j < itemCount; ++j) PrintItem(items[j]);
        }
    }
}

}  // namespace kest::tool
