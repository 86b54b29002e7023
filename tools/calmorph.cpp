// calmorph: looks into, converts and validates CDF calibration files from the command line.

#include <kest/calmorph.h>
#include <sys/stat.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

using namespace kest;

namespace {

enum ExitCode {
    kExitOk = 0,
    kExitUsage = 1,
    kExitCannotLoad = 2,
    kExitInvalid = 3,
    kExitConversion = 4,
    kExitCannotWrite = 5,
    kExitNoSchema = 6,
};

constexpr const char* kUsage =
    "calmorph - look into, convert and validate CDF calibration files\n"
    "\n"
    "Usage:\n"
    "  calmorph info FILE [--items]\n"
    "      Print the header, change history and calibration lists of FILE; with --items\n"
    "      also every item (name, units, format type, number of values, axis sizes).\n"
    "  calmorph convert IN OUT [--comment TEXT]\n"
    "      Read IN and write it to OUT as a UTF-8 CDF file, with TEXT as a comment at the\n"
    "      start of CAL-DATA. OUT is replaced only when the whole file could be written.\n"
    "  calmorph validate FILE... [--schema XSD]\n"
    "      Check each FILE against the schema it names (xsi:schemaLocation, resolved beside\n"
    "      the file), or against XSD under the CDF namespace. One line per file.\n"
    "  calmorph schema-location FILE\n"
    "      Print the schema location FILE names (the text after the first blank of its\n"
    "      xsi:schemaLocation).\n"
    "  calmorph --help\n"
    "      Print this text.\n"
    "\n"
    "Exit codes:\n"
    "  0  success; for validate: every file is valid\n"
    "  1  usage error: unknown command or option, missing or extra argument\n"
    "  2  an input cannot be loaded: missing, unreadable, not well-formed, not valid against\n"
    "     the schema it names, or no CAL-DATA element; for validate also a schema that cannot\n"
    "     be loaded\n"
    "  3  validate: a file is not valid against its schema\n"
    "  4  conversion error: the converter refused the content (reason code and item name)\n"
    "  5  the output file cannot be written\n"
    "  6  the file names no schema (no xsi:schemaLocation on its root)\n"
    "With several files, validate exits with the highest code of any file.\n"
    "Errors go to standard error and name the file, and the line and column of a load failure.\n";

// ----------------------------------------------------------------------------------------------
// Text helpers

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

std::string HexCode(HRESULT hr) {
    char buffer[16];
    std::snprintf(buffer, sizeof buffer, "0x%08X", static_cast<unsigned int>(hr));
    return buffer;
}

struct ReasonText {
    int code;
    const char* text;
};

constexpr ReasonText kReasonTexts[] = {
    {0, "CAL-DATA was not converted"},
    {11, "an AXIS attribute is missing"},
    {12, "a CAL-ITEM could not be read"},
    {13, "the document could not be walked"},
    {14, "a CAL-LIST could not be read"},
    {15, "CAL-DATA could not be read"},
    {16, "a CAL-DATA attribute is not an attribute node"},
    {17, "the TARGET-IMAGE attribute is not an attribute node"},
    {18, "SYMBOLIC-FILE has no crc32 attribute"},
    {19, "a VALUE attribute is not an attribute node"},
    {20, "an AXIS element has no attributes"},
    {21, "the XML service refused a new element"},
    {22, "a new element could not be created"},
    {23, "the schema-instance namespace (xmlns:xsi) is not set"},
    {24, "the schema location is not set"},
    {25, "a calibration list has no symbolic file"},
    {26, "an axis has no value"},
    {27, "an AXIS element has no attribute map"},
    {29, "an item has no value"},
    {30, "a calibration list has no name"},
    {31, "an item has no name"},
    {32, "the item count of a list is not set"},
    {33, "the change count is not set"},
    {34, "a year is out of range (1900..2300)"},
    {35, "a month is out of range"},
    {36, "a day is out of range"},
    {37, "an hour is out of range"},
    {38, "a minute is out of range"},
    {39, "a second is out of range"},
    {40, "a date text has the wrong length"},
    {41, "CAL-DATA has no attributes"},
    {42, "CAL-DATA lacks one of its three attributes (xmlns, xmlns:xsi, schema location)"},
    {44, "the schema file cannot be loaded"},
    {45, "the root names no schema (no xsi:schemaLocation)"},
};

const char* ReasonMeaning(int code) {
    for (const ReasonText& reason : kReasonTexts) {
        if (reason.code == code) return reason.text;
    }
    return "unknown reason";
}

void ReportConversionError(const std::string& file, const KestCalmorphDLLError& error) {
    std::string item = error.GetReasonString().ToString();
    std::fprintf(stderr, "calmorph: %s: conversion error: reason code %d (%s)", file.c_str(),
                 error.GetReason(), ReasonMeaning(error.GetReason()));
    if (!item.empty()) std::fprintf(stderr, " in item \"%s\"", Printable(item).c_str());
    std::fputc('\n', stderr);
}

// "file:line:column", "file:line" or "file", as far as the position is known.
std::string Where(const std::string& file, long line, long column) {
    std::string where = file;
    if (line > 0) where += ":" + std::to_string(line);
    if (line > 0 && column > 0) where += ":" + std::to_string(column);
    return where;
}

// Reads "line N, column M" from a parser's reason text; false when it holds no position.
bool PositionInReason(const std::string& reason, long& line, long& column) {
    std::string::size_type at = reason.find("at line ");
    if (at == std::string::npos) return false;
    return std::sscanf(reason.c_str() + at, "at line %ld, column %ld", &line, &column) == 2 &&
           line > 0;
}

// Names the position of a load failure: from the reason when it tells, otherwise by loading the
// file once more and asking the parse error.
void ReportLoadFailure(const std::string& file, const std::string& reason, bool validate) {
    long line = 0;
    long column = 0;
    if (!PositionInReason(reason, line, column)) {
        try {
            IXMLDOMDocument2Ptr document;
            if (SUCCEEDED(document.CreateInstance(kProgIdDOMDocument40))) {
                document->Putasync(VARIANT_FALSE);
                document->PutvalidateOnParse(validate ? VARIANT_TRUE : VARIANT_FALSE);
                if (document->load(_variant_t(file)) == VARIANT_FALSE) {
                    IXMLDOMParseErrorPtr parseError = document->GetparseError();
                    line = parseError->Getline();
                    column = parseError->Getlinepos();
                }
            }
        } catch (...) {
            // The reason alone still says what went wrong.
        }
    }
    std::fprintf(stderr, "calmorph: %s: cannot load: %s\n", Where(file, line, column).c_str(),
                 reason.c_str());
}

bool IsRegularReadableFile(const std::string& path) {
    std::FILE* file = std::fopen(path.c_str(), "rb");
    if (!file) return false;
    struct stat info {};
    bool regular = fstat(fileno(file), &info) == 0 && !S_ISDIR(info.st_mode);
    std::fclose(file);
    return regular;
}

std::string DirectoryOf(const std::string& path) {
    std::string::size_type separator = path.find_last_of('/');
    return separator == std::string::npos ? std::string() : path.substr(0, separator + 1);
}

// ----------------------------------------------------------------------------------------------
// Reading a file for info and convert

// Reads `file` into `data`; returns kExitOk or the exit code after reporting the failure.
int ReadCdf(KestCalmorph& converter, const std::string& file, KestCdfCalData& data) {
    CComBSTR message;
    try {
        data = converter.ConvertXMLtoCPP(CComBSTR(file), true, message);
    } catch (const KestCalmorphDLLError& error) {
        ReportConversionError(file, error);
        return kExitConversion;
    } catch (const _com_error& error) {
        std::fprintf(stderr, "calmorph: %s: conversion error: %s\n", file.c_str(), error.what());
        return kExitConversion;
    } catch (HRESULT hr) {
        std::fprintf(stderr, "calmorph: %s: no XML document can be created (%s)\n", file.c_str(),
                     HexCode(hr).c_str());
        return kExitCannotLoad;
    }
    if (message.Length() != 0) {
        ReportLoadFailure(file, message.ToString(), true);
        return kExitCannotLoad;
    }
    // Reading CAL-DATA always sets the namespace (empty when the root has none); a tree whose
    // namespace is still null found no CAL-DATA to convert.
    if (data.GetNamespace().m_string == nullptr) {
        std::fprintf(stderr, "calmorph: %s: no CAL-DATA element\n", file.c_str());
        return kExitCannotLoad;
    }
    return kExitOk;
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

// ----------------------------------------------------------------------------------------------
// Commands

int CommandInfo(const std::vector<std::string>& args) {
    std::string file;
    bool withItems = false;
    for (const std::string& arg : args) {
        if (arg == "--items") {
            withItems = true;
        } else if (arg.size() > 1 && arg[0] == '-') {
            std::fprintf(stderr, "calmorph: info: unknown option %s\n", arg.c_str());
            return kExitUsage;
        } else if (file.empty()) {
            file = arg;
        } else {
            std::fprintf(stderr, "calmorph: info: one file only (extra argument %s)\n",
                         arg.c_str());
            return kExitUsage;
        }
    }
    if (file.empty()) {
        std::fprintf(stderr, "calmorph: info: missing FILE\nusage: calmorph info FILE [--items]\n");
        return kExitUsage;
    }
    KestCalmorph converter;
    KestCdfCalData data;
    int code = ReadCdf(converter, file, data);
    if (code != kExitOk) return code;
    PrintInfo(file, data, withItems);
    return kExitOk;
}

int CommandConvert(const std::vector<std::string>& args) {
    std::vector<std::string> files;
    std::string comment;
    for (std::size_t i = 0; i < args.size(); ++i) {
        const std::string& arg = args[i];
        if (arg == "--comment") {
            if (i + 1 >= args.size()) {
                std::fprintf(stderr, "calmorph: convert: --comment needs a TEXT\n");
                return kExitUsage;
            }
            comment = args[++i];
        } else if (arg.size() > 1 && arg[0] == '-') {
            std::fprintf(stderr, "calmorph: convert: unknown option %s\n", arg.c_str());
            return kExitUsage;
        } else {
            files.push_back(arg);
        }
    }
    if (files.size() != 2) {
        std::fprintf(stderr,
                     "calmorph: convert: needs IN and OUT\n"
                     "usage: calmorph convert IN OUT [--comment TEXT]\n");
        return kExitUsage;
    }
    const std::string& in = files[0];
    const std::string& out = files[1];
    if (out.empty()) {
        std::fprintf(stderr, "calmorph: convert: the output path is empty\n");
        return kExitUsage;
    }

    KestCalmorph converter;
    KestCdfCalData data;
    int code = ReadCdf(converter, in, data);
    if (code != kExitOk) return code;
    try {
        if (!converter.ConvertCPPToXML(data, CComBSTR(out), CComBSTR(comment))) {
            std::fprintf(stderr, "calmorph: %s: nothing was written\n", out.c_str());
            return kExitCannotWrite;
        }
    } catch (const KestCalmorphDLLError& error) {
        ReportConversionError(in, error);
        return kExitConversion;
    } catch (const _com_error& error) {
        std::fprintf(stderr, "calmorph: %s: cannot write: %s\n", out.c_str(), error.what());
        return kExitCannotWrite;
    } catch (HRESULT hr) {
        std::fprintf(stderr, "calmorph: %s: no XML document can be created (%s)\n", out.c_str(),
                     HexCode(hr).c_str());
        return kExitCannotWrite;
    }
    return kExitOk;
}

// Validates against the schema the file names: the document is loaded without validation, its
// root tells the schema, and the DOM validates it against that schema.
int ValidateAgainstNamedSchema(const std::string& file) {
    IXMLDOMDocument2Ptr document;
    HRESULT hr = document.CreateInstance(kProgIdDOMDocument40);
    if (FAILED(hr)) {
        std::fprintf(stderr, "calmorph: %s: no XML document can be created (%s)\n", file.c_str(),
                     HexCode(hr).c_str());
        return kExitCannotLoad;
    }
    document->Putasync(VARIANT_FALSE);
    document->PutvalidateOnParse(VARIANT_FALSE);
    document->setProperty(_bstr_t(u"ServerHTTPRequest"), _variant_t(true));
    if (document->load(_variant_t(file)) == VARIANT_FALSE) {
        ReportLoadFailure(file, document->GetparseError()->Getreason().ToString(), false);
        return kExitCannotLoad;
    }

    IXMLDOMElementPtr root = document->GetdocumentElement();
    std::string location;
    std::string schemaLocation;
    if (IXMLDOMAttributePtr attribute = root->getAttributeNode(_bstr_t(u"xsi:schemaLocation"))) {
        std::string value = _bstr_t(attribute->GetnodeValue()).ToString();
        std::string::size_type blank = value.find(' ');
        location = blank == std::string::npos ? value : value.substr(blank + 1);
    } else if (IXMLDOMAttributePtr noNamespace =
                   root->getAttributeNode(_bstr_t(u"xsi:noNamespaceSchemaLocation"))) {
        location = _bstr_t(noNamespace->GetnodeValue()).ToString();
    } else {
        std::fprintf(stderr,
                     "calmorph: %s: names no schema (no xsi:schemaLocation); use --schema XSD\n",
                     file.c_str());
        return kExitNoSchema;
    }

    // A single local location is looked up where the validator will look: beside the file.
    bool local = location.compare(0, 4, "http") != 0 && location.find(' ') == std::string::npos;
    if (local) {
        std::string resolved = location;
        if (!location.empty() && location[0] != '/') resolved = DirectoryOf(file) + location;
        if (!IsRegularReadableFile(resolved)) {
            std::fprintf(stderr, "calmorph: %s: the schema it names cannot be read: %s\n",
                         file.c_str(), resolved.c_str());
            return kExitCannotLoad;
        }
    }

    IXMLDOMParseErrorPtr result = document->validate();
    std::string reason = result->Getreason().ToString();
    if (reason.empty()) {
        std::printf("%s: valid against %s\n", file.c_str(), location.c_str());
        return kExitOk;
    }
    std::fprintf(stderr, "calmorph: %s: not valid against %s: %s\n",
                 Where(file, result->Getline(), result->Getlinepos()).c_str(), location.c_str(),
                 reason.c_str());
    return kExitInvalid;
}

int ValidateAgainstSchemaFile(KestCalmorph& converter, const std::string& file,
                              const std::string& schema) {
    CComBSTR message;
    try {
        message = converter.ValidateXMLFileWithLocaleXSD(CComBSTR(file), CComBSTR(schema));
    } catch (const KestCalmorphDLLError& error) {
        if (error.GetReason() == reason::kSchemaNotLoaded) {
            std::fprintf(stderr, "calmorph: %s: the schema file cannot be loaded\n",
                         schema.c_str());
        } else {
            ReportConversionError(file, error);
        }
        return kExitCannotLoad;
    } catch (const _com_error& error) {
        std::fprintf(stderr, "calmorph: %s: the schema is refused: %s\n", schema.c_str(),
                     error.what());
        return kExitCannotLoad;
    } catch (HRESULT hr) {
        std::fprintf(stderr, "calmorph: %s: no XML document can be created (%s)\n", file.c_str(),
                     HexCode(hr).c_str());
        return kExitCannotLoad;
    }
    if (message.Length() == 0) {
        std::printf("%s: valid against %s\n", file.c_str(), schema.c_str());
        return kExitOk;
    }

    // The message alone does not tell a file that does not load from one that is invalid.
    IXMLDOMDocument2Ptr document;
    if (SUCCEEDED(document.CreateInstance(kProgIdDOMDocument40))) {
        document->Putasync(VARIANT_FALSE);
        document->PutvalidateOnParse(VARIANT_FALSE);
        if (document->load(_variant_t(file)) == VARIANT_FALSE) {
            ReportLoadFailure(file, message.ToString(), false);
            return kExitCannotLoad;
        }
    }
    std::fprintf(stderr, "calmorph: %s: not valid against %s: %s\n", file.c_str(), schema.c_str(),
                 message.ToString().c_str());
    return kExitInvalid;
}

int CommandValidate(const std::vector<std::string>& args) {
    std::vector<std::string> files;
    std::string schema;
    bool haveSchema = false;
    for (std::size_t i = 0; i < args.size(); ++i) {
        const std::string& arg = args[i];
        if (arg == "--schema") {
            if (i + 1 >= args.size()) {
                std::fprintf(stderr, "calmorph: validate: --schema needs an XSD file\n");
                return kExitUsage;
            }
            schema = args[++i];
            haveSchema = true;
        } else if (arg.size() > 1 && arg[0] == '-') {
            std::fprintf(stderr, "calmorph: validate: unknown option %s\n", arg.c_str());
            return kExitUsage;
        } else {
            files.push_back(arg);
        }
    }
    if (files.empty()) {
        std::fprintf(stderr,
                     "calmorph: validate: missing FILE\n"
                     "usage: calmorph validate FILE... [--schema XSD]\n");
        return kExitUsage;
    }
    KestCalmorph converter;
    int worst = kExitOk;
    for (const std::string& file : files) {
        int code = haveSchema ? ValidateAgainstSchemaFile(converter, file, schema)
                              : ValidateAgainstNamedSchema(file);
        worst = std::max(worst, code);
    }
    return worst;
}

int CommandSchemaLocation(const std::vector<std::string>& args) {
    if (args.size() != 1 || (args[0].size() > 1 && args[0][0] == '-')) {
        std::fprintf(stderr,
                     "calmorph: schema-location: needs exactly one FILE\n"
                     "usage: calmorph schema-location FILE\n");
        return kExitUsage;
    }
    const std::string& file = args[0];
    KestCalmorph converter;
    CComBSTR message;
    CComBSTR location;
    try {
        location = converter.DetectSchemaLocation(CComBSTR(file), message);
    } catch (const KestCalmorphDLLError& error) {
        if (error.GetReason() == reason::kSchemaLocationAbsent) {
            std::fprintf(stderr, "calmorph: %s: names no schema (no xsi:schemaLocation)\n",
                         file.c_str());
            return kExitNoSchema;
        }
        std::fprintf(stderr, "calmorph: %s: cannot load (reason code %d: %s)\n", file.c_str(),
                     error.GetReason(), ReasonMeaning(error.GetReason()));
        return kExitCannotLoad;
    } catch (const _com_error& error) {
        std::fprintf(stderr, "calmorph: %s: %s\n", file.c_str(), error.what());
        return kExitCannotLoad;
    } catch (HRESULT hr) {
        std::fprintf(stderr, "calmorph: %s: no XML document can be created (%s)\n", file.c_str(),
                     HexCode(hr).c_str());
        return kExitCannotLoad;
    }
    if (message.Length() != 0) {
        ReportLoadFailure(file, message.ToString(), true);
        return kExitCannotLoad;
    }
    std::printf("%s\n", location.ToString().c_str());
    return kExitOk;
}

}  // namespace

int main(int argc, char** argv) {
    std::vector<std::string> args(argv + 1, argv + argc);
    if (args.empty()) {
        std::fputs(kUsage, stderr);
        return kExitUsage;
    }
    const std::string command = args.front();
    args.erase(args.begin());
    if (command == "--help" || command == "-h" || command == "help") {
        std::fputs(kUsage, stdout);
        return kExitOk;
    }
    try {
        if (command == "info") return CommandInfo(args);
        if (command == "convert") return CommandConvert(args);
        if (command == "validate") return CommandValidate(args);
        if (command == "schema-location") return CommandSchemaLocation(args);
    } catch (const KestCalmorphDLLError& error) {
        std::fprintf(stderr, "calmorph: reason code %d (%s)\n", error.GetReason(),
                     ReasonMeaning(error.GetReason()));
        return kExitConversion;
    } catch (const std::exception& error) {
        std::fprintf(stderr, "calmorph: %s\n", error.what());
        return kExitConversion;
    } catch (HRESULT hr) {
        std::fprintf(stderr, "calmorph: no XML document can be created (%s)\n",
                     HexCode(hr).c_str());
        return kExitCannotLoad;
    }
    std::fprintf(stderr, "calmorph: unknown command '%s' (try calmorph --help)\n", command.c_str());
    return kExitUsage;
}
