#include "CdfGen.h"

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <stdexcept>

namespace kest {
namespace bench {
namespace {

// A small deterministic generator, so that a seed gives the same file on every platform
// (the standard distributions are not specified bit for bit).
class Rng {
  public:
    explicit Rng(std::uint64_t seed)
        : m_state(seed * 0x9E3779B97F4A7C15ull + 0x2545F4914F6CDD1Dull) {}
    std::uint64_t Next() {
        // splitmix64
        std::uint64_t z = (m_state += 0x9E3779B97F4A7C15ull);
        z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ull;
        z = (z ^ (z >> 27)) * 0x94D049BB133111EBull;
        return z ^ (z >> 31);
    }
    /// Uniform in [lo, hi].
    long Int(long lo, long hi) {
        return lo + static_cast<long>(Next() % static_cast<std::uint64_t>(hi - lo + 1));
    }
    /// Uniform in [0, 1).
    double Real() { return static_cast<double>(Next() >> 11) * (1.0 / 9007199254740992.0); }
    bool Chance(int percent) { return Int(0, 99) < percent; }
    template <class T, std::size_t N>
    const T& Pick(const T (&items)[N]) {
        return items[Next() % N];
    }

  private:
    std::uint64_t m_state;
};

// Buffered output with the few formatting helpers the generator needs.
class Out {
  public:
    explicit Out(const std::string& path) : m_path(path) {
        m_file = std::fopen(path.c_str(), "wb");
        if (!m_file) Fail();
        m_buffer.reserve(kFlushAt + 4096);
    }
    ~Out() {
        if (m_file) std::fclose(m_file);
    }
    Out(const Out&) = delete;
    Out& operator=(const Out&) = delete;

    Out& operator<<(const char* text) {
        m_buffer.append(text);
        Spill();
        return *this;
    }
    Out& operator<<(const std::string& text) {
        m_buffer.append(text);
        Spill();
        return *this;
    }
    Out& operator<<(long n) {
        char digits[32];
        std::snprintf(digits, sizeof digits, "%ld", n);
        return *this << digits;
    }
    void Indent(int level, bool indent) {
        if (!indent) return;
        m_buffer.push_back('\n');
        m_buffer.append(static_cast<std::size_t>(level) * 2, ' ');
    }
    std::uint64_t Close() {
        Flush();
        if (std::fclose(m_file) != 0) {
            m_file = nullptr;
            Fail();
        }
        m_file = nullptr;
        return m_written;
    }

  private:
    static constexpr std::size_t kFlushAt = 1 << 20;
    void Spill() {
        if (m_buffer.size() >= kFlushAt) Flush();
    }
    void Flush() {
        if (!m_buffer.empty() &&
            std::fwrite(m_buffer.data(), 1, m_buffer.size(), m_file) != m_buffer.size())
            Fail();
        m_written += m_buffer.size();
        m_buffer.clear();
    }
    [[noreturn]] void Fail() {
        throw std::runtime_error("cannot write " + m_path + ": " + std::strerror(errno));
    }

    std::string m_path;
    std::FILE* m_file = nullptr;
    std::string m_buffer;
    std::uint64_t m_written = 0;
};

// A number as a calibration tool writes it: fixed decimals without trailing zeros. Such a
// text has at most 15 significant digits, so "%.15g" gives it back unchanged and a file
// written from the read tree carries the same numbers.
std::string FixedText(double v, int decimals) {
    char text[64];
    std::snprintf(text, sizeof text, "%.*f", decimals, v);
    std::string s(text);
    if (s.find('.') != std::string::npos) {
        while (s.back() == '0') s.pop_back();
        if (s.back() == '.') s.pop_back();
    }
    if (s == "-0") s = "0";
    return s;
}

// A number as the library writes a double: "%.15g" with at least three exponent digits.
std::string G15Text(double v) {
    char text[64];
    std::snprintf(text, sizeof text, "%.15g", v);
    std::string s(text);
    const std::size_t e = s.find('e');
    if (e != std::string::npos) {
        std::size_t digits = s.size() - (e + 2);
        if (digits < 3) s.insert(e + 2, 3 - digits, '0');
    }
    if (s == "-0") s = "0";
    return s;
}

// A small magnitude in the exponent form the library writes (three exponent digits); the
// mantissa keeps a '.', so that the number reads as a double wherever it stands in a list.
std::string TinyText(Rng& rng) {
    char text[64];
    std::snprintf(text, sizeof text, "%.*fe-%03ld", static_cast<int>(rng.Int(1, 4)),
                  1.0 + rng.Real() * 8.9, rng.Int(5, 9));
    return text;
}

const char* const kPrefixes[] = {"KF",  "KL",  "FW",    "MN",  "ZW",  "TQ",  "LAM", "ETA",
                                 "RL",  "ML",  "DK",    "ABG", "BST", "INJ", "IGN", "THR",
                                 "EGR", "VVT", "KNOCK", "CAT", "OIL", "FAN", "TCU", "DPF"};
const char* const kWords[] = {"MAX",   "MIN",  "OFS",  "FAC",   "LIM",  "CORR", "BASE",
                              "ADAPT", "FILT", "HYST", "DELAY", "GAIN", "TGT",  "THRES",
                              "IDLE",  "WARM", "COLD", "START", "LOAD", "SPEED"};
const char* const kUnits[] = {"rpm", "Nm",  "%", "degC", "mg/stroke", "-",   "kPa",
                              "ms",  "V",   "A", "km/h", "lambda",    "bar", "deg CrS",
                              "mg",  "g/s", "s", "Hz",   "mbar",      "K"};
const char* const kAnnotations[] = {
    "Applied at end of line; do not change without release of the application group",
    "Derived from dyno run 2024/17, corrected for altitude",
    "Limits the torque request during gear change",
    "Filter time constant of the sensor signal",
    "Base value before temperature correction",
    "Adapted value; reset on software update",
    "Used by the idle speed controller only",
    "Hysteresis of the switching threshold",
    "Protects the catalyst against overheating; see application note AN-2231",
    "Factor applied to the injected quantity in warm-up"};
const char* const kNotes[] = {"checked", "to be reviewed", "copied from variant B",
                              "changed for emission test", "value from supplier"};
const char* const kLabels[] = {"MODE_NORMAL",  "MODE_SPORT",    "MODE_ECO",
                               "CURVE_LINEAR", "SENSOR_TYPE_B", "OFF"};
const char* const kStrings[] = {"ON", "OFF", "AUTO", "LOW", "HIGH", "NONE", "FAST", "SLOW"};
const char* const kUsers[] = {"mbauer", "jschmidt", "a.novak", "lchen", "rgarcia"};
const char* const kTools[] = {"CalEdit 7.2", "CalEdit 7.3", "FlashPro 2.0", "calmorph 0.1"};

// Axis points are monotonic breakpoints: round steps, or raw integers times a factor as the
// control unit stores them (percent from 8-bit raw values, lambda in 1/1024 steps).
struct AxisShape {
    const char* units;
    double start;
    double step;
    int decimals;   // decimals of a fixed text, or -1 for fifteen significant digits
    double factor;  // applied to start + step * i
};

AxisShape RandomAxisShape(Rng& rng) {
    switch (rng.Int(0, 5)) {
        case 0:
            return {"rpm", 500.0 + 250.0 * rng.Int(0, 4), 250.0 * rng.Int(1, 4), 0, 1.0};
        case 1:
            return {"%", 0.0, static_cast<double>(rng.Int(9, 16)), -1, 100.0 / 255.0};
        case 2:
            return {"degC", -40.0, 10.0 + rng.Int(0, 2) * 5.0, 0, 1.0};
        case 3:
            return {"Nm", 0.0, 12.5 * rng.Int(1, 4), 2, 1.0};
        case 4:
            return {"kPa", 20.0, 7.5 + rng.Int(0, 3) * 2.5, 2, 1.0};
        default:
            return {"lambda", 717.0, static_cast<double>(rng.Int(13, 41)), 10, 1.0 / 1024.0};
    }
}

void WriteAxis(Out& out, Rng& rng, int level, bool indent, int points) {
    const AxisShape shape = RandomAxisShape(rng);
    out.Indent(level, indent);
    out << "<AXIS size=\"" << static_cast<long>(points) << "\" sw-units=\"" << shape.units
        << "\" format-type=\"NUMERIC\">";
    for (int i = 0; i < points; ++i) {
        if (i) out << " ";
        const double v = (shape.start + shape.step * i) * shape.factor;
        out << (shape.decimals < 0 ? G15Text(v) : FixedText(v, shape.decimals));
    }
    out << "</AXIS>";
}

// Values of one table. ECU data is stored as integers and shown as the integer times a
// conversion factor. Factors such as 100/255 give values that exports print with all fifteen
// significant digits; binary factors (2^-k) give long exact decimal expansions; decimal factors
// give short ones. The raw values form a smooth surface.
struct ValueShape {
    double rawBase;
    double rawSlopeI;
    double rawSlopeJ;
    double factor;
    int decimals;  // exact number of decimals of raw * factor; -1: fifteen significant digits
    bool tiny;
};

ValueShape RandomValueShape(Rng& rng) {
    static const double kRationalFactors[] = {100.0 / 255.0, 1.0 / 3.0,     5.0 / 1023.0,
                                              0.1 / 0.3,     360.0 / 65535, 1.0 / 12.0,
                                              2.0 / 7.0,     10.0 / 2047.0};
    ValueShape s;
    s.rawBase = static_cast<double>(rng.Int(0, 20000));
    if (rng.Chance(15)) s.rawBase = -s.rawBase;
    s.rawSlopeI = static_cast<double>(rng.Int(1, 2500));
    s.rawSlopeJ = static_cast<double>(rng.Int(0, 1500));
    const long r = rng.Int(0, 99);
    if (r < 75) {
        s.decimals = -1;
        s.factor = rng.Pick(kRationalFactors) * std::pow(10.0, static_cast<double>(rng.Int(-2, 1)));
    } else if (r < 95) {
        s.decimals = static_cast<int>(rng.Int(3, 12));
        s.factor = std::ldexp(1.0, -s.decimals);
    } else {
        s.decimals = static_cast<int>(rng.Int(0, 3));
        s.factor = std::pow(10.0, -s.decimals);
    }
    s.tiny = rng.Chance(2);
    return s;
}

std::string ValueText(Rng& rng, const ValueShape& shape, int i, int j) {
    if (shape.tiny) return TinyText(rng);
    const double raw = shape.rawBase + shape.rawSlopeI * i + shape.rawSlopeJ * j +
                       static_cast<double>(rng.Int(-20, 20));
    if (shape.decimals < 0) return G15Text(raw * shape.factor);
    return FixedText(raw * shape.factor, shape.decimals);
}

void WriteText(Out& out, int level, bool indent, const char* name, const std::string& text) {
    out.Indent(level, indent);
    out << "<" << name << ">" << text << "</" << name << ">";
}

enum class ItemKind { Value, Curve, Map };

void WriteItem(Out& out, Rng& rng, long index, bool indent, CdfGenResult& result) {
    const int level = 2;
    const long r = rng.Int(0, 99);
    const ItemKind kind = r < 58 ? ItemKind::Value : r < 84 ? ItemKind::Curve : ItemKind::Map;
    out.Indent(level, indent);
    out << "<CAL-ITEM>";
    std::string name = std::string(rng.Pick(kPrefixes)) + "_" + rng.Pick(kWords) + "_" +
                       rng.Pick(kWords) + "_" + std::to_string(index);
    WriteText(out, level + 1, indent, "NAME", name);

    const char* units = rng.Pick(kUnits);
    if (kind == ItemKind::Value) {
        ++result.values;
        const long f = rng.Int(0, 99);
        out.Indent(level + 1, indent);
        if (f < 3) {
            // A selection among strings, quoted as the STRING format wants it.
            out << "<VALUE sw-units-ref=\"-\" format-type=\"STRING\">";
            const long n = rng.Int(1, 3);
            for (long k = 0; k < n; ++k) {
                if (k) out << " ";
                out << "\"" << rng.Pick(kStrings) << "\"";
            }
        } else if (f < 5) {
            out << "<VALUE sw-units-ref=\"-\" format-type=\"LABEL\">" << rng.Pick(kLabels);
        } else {
            out << "<VALUE sw-units-ref=\"" << units << "\" format-type=\"NUMERIC\">";
            const ValueShape shape = RandomValueShape(rng);
            out << ValueText(rng, shape, 0, 0);
        }
        out << "</VALUE>";
    } else {
        const int n = static_cast<int>(rng.Int(8, 16));
        const int m = kind == ItemKind::Map ? static_cast<int>(rng.Int(8, 16)) : 1;
        WriteAxis(out, rng, level + 1, indent, n);
        if (kind == ItemKind::Map) WriteAxis(out, rng, level + 1, indent, m);
        (kind == ItemKind::Map ? result.maps : result.curves) += 1;
        const ValueShape shape = RandomValueShape(rng);
        out.Indent(level + 1, indent);
        out << "<VALUE sw-units-ref=\"" << units << "\" format-type=\"NUMERIC\">";
        for (int j = 0; j < m; ++j)
            for (int i = 0; i < n; ++i) {
                if (i || j) out << " ";
                out << ValueText(rng, shape, i, j);
            }
        out << "</VALUE>";
    }
    if (rng.Chance(50)) WriteText(out, level + 1, indent, "ANNOTATION", rng.Pick(kAnnotations));
    if (rng.Chance(20)) WriteText(out, level + 1, indent, "NOTE", rng.Pick(kNotes));
    out.Indent(level, indent);
    out << "</CAL-ITEM>";
}

std::string Crc(Rng& rng) {
    char text[16];
    std::snprintf(text, sizeof text, "0x%08X", static_cast<unsigned>(rng.Next() & 0xFFFFFFFFu));
    return text;
}

std::string DateText(Rng& rng, int changeIndex) {
    char text[32];
    std::snprintf(text, sizeof text, "%04d-%02ld-%02ldT%02ld:%02ld:%02ld", 2022 + changeIndex / 2,
                  rng.Int(1, 12), rng.Int(1, 28), rng.Int(6, 19), rng.Int(0, 59), rng.Int(0, 59));
    return text;
}

}  // namespace

CdfGenResult GenerateCdf(const CdfGenOptions& options, const std::string& path) {
    if (options.items < 0) throw std::invalid_argument("item count must not be negative");
    CdfGenResult result;
    Rng rng(options.seed);
    const bool indent = options.indent;
    int lists = options.lists > 0 ? options.lists
                                  : static_cast<int>(std::max(1L, (options.items + 4999) / 5000));
    result.lists = lists;

    Out out(path);
    out << "<?xml version=\"1.0\" encoding=\"UTF-8\"?>";
    out.Indent(0, indent);
    out << "<CAL-DATA xmlns=\"" << kCdfNamespace
        << "\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" ";
    if (options.schema)
        out << "xsi:schemaLocation=\"" << kCdfNamespace << " cdf.xsd\">";
    else
        out << "xmlns:cdf=\"" << kCdfNamespace << "\">";

    out.Indent(1, indent);
    out << "<CHANGE-HISTORY>";
    const int changes = 5;
    for (int c = 0; c < changes; ++c) {
        out.Indent(2, indent);
        out << "<CHANGE>";
        WriteText(out, 3, indent, "USERNAME", rng.Pick(kUsers));
        WriteText(out, 3, indent, "DATE", DateText(rng, c));
        WriteText(out, 3, indent, "TOOL", rng.Pick(kTools));
        if (c % 2 == 0)
            WriteText(out, 3, indent, "NOTE",
                      "Release " + std::to_string(c + 1) + " for test fleet");
        WriteText(out, 3, indent, "DATA-VERSION", "1." + std::to_string(c) + ".0");
        out.Indent(2, indent);
        out << "</CHANGE>";
    }
    out.Indent(1, indent);
    out << "</CHANGE-HISTORY>";
    WriteText(out, 1, indent, "FILENAME", "ECU_" + std::to_string(options.seed) + "_dataset.cdf");
    WriteText(out, 1, indent, "COMPANY-INFO", "Kest Powertrain R&amp;D, Calibration Department");
    WriteText(out, 1, indent, "NOTE", "Generated data set for performance measurements");

    long written = 0;
    for (int l = 0; l < lists; ++l) {
        const long count = options.items / lists + (l < options.items % lists ? 1 : 0);
        out.Indent(1, indent);
        out << "<CAL-LIST>";
        WriteText(out, 2, indent, "NAME", "LIST_" + std::to_string(l) + "_" + rng.Pick(kPrefixes));
        out.Indent(2, indent);
        out << "<SYMBOLIC-FILE crc32=\"" << Crc(rng) << "\">ecu_sw_" << static_cast<long>(l)
            << ".a2l</SYMBOLIC-FILE>";
        if (l % 4 != 3) {
            out.Indent(2, indent);
            out << "<TARGET-IMAGE crc32=\"" << Crc(rng) << "\">ecu_sw_" << static_cast<long>(l)
                << ".hex</TARGET-IMAGE>";
        }
        if (l % 2 == 0) WriteText(out, 2, indent, "NOTE", "Calibration list " + std::to_string(l));
        for (long i = 0; i < count; ++i) WriteItem(out, rng, written++, indent, result);
        out.Indent(1, indent);
        out << "</CAL-LIST>";
    }
    out.Indent(0, indent);
    out << "</CAL-DATA>\n";
    result.items = written;
    result.bytes = out.Close();
    return result;
}

}  // namespace bench
}  // namespace kest
