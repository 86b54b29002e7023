// Fuzz target: arbitrary bytes read as a CDF file (with the schema beside it), the tree written,
// the written file read again. The two trees must agree field by field: what the library
// writes, it reads back to the same values. Bytes that do not read, and trees the writer
// refuses as incomplete, end the run quietly.
#include <unistd.h>

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string>

#include "core/KestCalmorph.h"
#include "platform/KestCalmorphDLLError.h"

using namespace kest;

namespace {

[[noreturn]] void Fail(const std::string& what) {
    std::fprintf(stderr, "fuzz_roundtrip: %s\n", what.c_str());
    std::abort();
}

std::u16string Text(const KestCdfNormalizedString& s) { return s.ToU16String(); }
std::u16string Text(const CComBSTR& s) { return s.m_str ? u"=" + s.ToU16String() : u"null"; }
std::u16string Text(long long n) {
    const std::string digits = std::to_string(n);
    return std::u16string(digits.begin(), digits.end());
}

// A list's optional target image as one text.
std::u16string ImageText(const KestCdfCalList& list) {
    try {
        const KestCdfTargetImage image = list.GetTargetImage();
        return Text(image.GetTargetImage()) + Text(image.GetCrc());
    } catch (const _com_error&) {
        return u"none";
    }
}

template <class T>
void Same(const T& a, const T& b, const std::string& where) {
    if (Text(a) != Text(b)) Fail(where + " differs");
}

// Elements agree when they hold the same value. A whole double may come back as the integer of
// that value: "%.15g" writes -464.0 as -464, which the integer rule then reads.
void SameElement(const VARIANT& a, const VARIANT& b, const std::string& where) {
    const bool numberA = a.vt == VT_I4 || a.vt == VT_R8, numberB = b.vt == VT_I4 || b.vt == VT_R8;
    if (numberA && numberB) {
        const double x = a.vt == VT_I4 ? a.lVal : a.dblVal;
        const double y = b.vt == VT_I4 ? b.lVal : b.dblVal;
        if (std::isnan(x) && std::isnan(y)) return;
        if (x != y || std::signbit(x) != std::signbit(y)) Fail(where + ": numbers differ");
        if (a.vt != b.vt && (x != std::trunc(x) || std::fabs(x) > 2147483647.0))
            Fail(where + ": number type differs");
        return;
    }
    if (a.vt != b.vt)
        Fail(where + ": element types " + std::to_string(a.vt) + " and " + std::to_string(b.vt));
    if (a.vt == VT_BSTR && BstrView(a.bstrVal) != BstrView(b.bstrVal)) Fail(where + " differs");
}

void SameValue(const _variant_t& a, const _variant_t& b, const std::string& where) {
    if (a.vt != b.vt) Fail(where + ": value types differ");
    if (a.vt != (VT_ARRAY | VT_VARIANT)) return;
    const ULONG n = a.parray->rgsabound[0].cElements;
    if (n != b.parray->rgsabound[0].cElements) Fail(where + " count differs");
    const VARIANT* x = static_cast<const VARIANT*>(a.parray->pvData);
    const VARIANT* y = static_cast<const VARIANT*>(b.parray->pvData);
    for (ULONG i = 0; i < n; ++i) SameElement(x[i], y[i], where + "[" + std::to_string(i) + "]");
}

void SameTree(const KestCdfCalData& a, const KestCdfCalData& b) {
    Same(a.GetNamespace(), b.GetNamespace(), "namespace");
    Same(a.GetSchemaInstance(), b.GetSchemaInstance(), "schema instance");
    Same(a.GetSchemaLocation(), b.GetSchemaLocation(), "schema location");
    Same(a.GetCompany(), b.GetCompany(), "company");
    Same(a.GetFileName(), b.GetFileName(), "file name");
    Same(a.GetNote(), b.GetNote(), "note");
    const KestCdfChangeHistory ha = a.GetChangeHistory(), hb = b.GetChangeHistory();
    Same(ha.GetChangeArraySize(), hb.GetChangeArraySize(), "changes");
    for (int i = 0; i < ha.GetChangeArraySize(); ++i) {
        const KestCdfChange& ca = ha.GetChange()[i];
        const KestCdfChange& cb = hb.GetChange()[i];
        const std::string at = "change " + std::to_string(i);
        Same(ca.GetUserNameW(), cb.GetUserNameW(), at + " user");
        Same(ca.GetDate().CreateTimeString(), cb.GetDate().CreateTimeString(), at + " date");
        Same(ca.GetTool(), cb.GetTool(), at + " tool");
        Same(ca.GetNote(), cb.GetNote(), at + " note");
        Same(ca.GetDataVersion(), cb.GetDataVersion(), at + " version");
    }
    Same(a.GetCalListSize(), b.GetCalListSize(), "lists");
    for (int l = 0; l < a.GetCalListSize(); ++l) {
        const KestCdfCalList& la = a.GetCalLists()[l];
        const KestCdfCalList& lb = b.GetCalLists()[l];
        const std::string at = "list " + std::to_string(l);
        Same(la.GetName(), lb.GetName(), at + " name");
        Same(la.GetNote(), lb.GetNote(), at + " note");
        Same(la.GetSymbolicFile().GetSymbolicFile(), lb.GetSymbolicFile().GetSymbolicFile(), at);
        Same(la.GetSymbolicFile().GetCrc(), lb.GetSymbolicFile().GetCrc(), at + " crc");
        if (ImageText(la) != ImageText(lb)) Fail(at + " target image differs");
        Same(la.GetCalItemSize(), lb.GetCalItemSize(), at + " items");
        for (int i = 0; i < la.GetCalItemSize(); ++i) {
            const KestCdfCalItem& ia = la.GetCalItems()[i];
            const KestCdfCalItem& ib = lb.GetCalItems()[i];
            const std::string item = at + " item " + std::to_string(i);
            Same(ia.GetName(), ib.GetName(), item + " name");
            Same(ia.GetAnnotation(), ib.GetAnnotation(), item + " annotation");
            Same(ia.GetNote(), ib.GetNote(), item + " note");
            Same(ia.GetAxisSize(), ib.GetAxisSize(), item + " axes");
            for (int x = 0; x < ia.GetAxisSize(); ++x) {
                const KestCdfAxis& xa = ia.GetAxis()[x];
                const KestCdfAxis& xb = ib.GetAxis()[x];
                const std::string axis = item + " axis " + std::to_string(x);
                Same(xa.GetSize(), xb.GetSize(), axis + " size");
                Same(xa.GetSwUnits(), xb.GetSwUnits(), axis + " units");
                Same(xa.GetFormatType(), xb.GetFormatType(), axis + " format");
                SameValue(xa.GetAxisValue(), xb.GetAxisValue(), axis);
            }
            const KestCdfCalItemValue va = ia.GetCalItemValue(), vb = ib.GetCalItemValue();
            Same(va.GetUnits(), vb.GetUnits(), item + " units");
            Same(va.GetFormatType(), vb.GetFormatType(), item + " format");
            SameValue(va.GetValue(), vb.GetValue(), item + " value");
        }
    }
}

// A folder of this process holding the schema, so that the files name it as "cdf.xsd".
const std::string& Folder() {
    static const std::string folder = [] {
        char pattern[] = "/tmp/fuzz_roundtrip.XXXXXX";
        if (!mkdtemp(pattern)) Fail("no temporary folder");
        std::ifstream in(std::string(KEST_SCHEMA_DIR) + "/cdf.xsd", std::ios::binary);
        std::ofstream(std::string(pattern) + "/cdf.xsd", std::ios::binary) << in.rdbuf();
        return std::string(pattern);
    }();
    return folder;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string input = Folder() + "/in.cdf", output = Folder() + "/out.cdf";
    std::ofstream(input, std::ios::binary | std::ios::trunc)
        .write(reinterpret_cast<const char*>(data), static_cast<std::streamsize>(size));
    KestCalmorph reader;
    CComBSTR message;
    KestCdfCalData first;
    try {
        first = reader.ConvertXMLtoCPP(CComBSTR(input.c_str()), true, message);
        if (message.Length() != 0) return 0;
        if (!reader.ConvertCPPToXML(first, CComBSTR(output.c_str()), CComBSTR())) return 0;
    } catch (const KestCalmorphDLLError&) {
        return 0;  // refused on reading, or incomplete for the writer
    } catch (const _com_error&) {
        return 0;
    }
    KestCalmorph again;
    KestCdfCalData second;
    try {
        second = again.ConvertXMLtoCPP(CComBSTR(output.c_str()), true, message);
    } catch (const KestCalmorphDLLError& error) {
        Fail("written file does not read back: reason " + std::to_string(error.GetReason()));
    }
    if (message.Length() != 0) {
        // A root without a usable schema location (unbound or misspelled) is read without
        // validation, while the writer always writes a proper one: the output is then
        // validated and may fail. The converter's check of its output reports that; it is no
        // loss of values. Anything else the writer wrote must read back.
        const std::string schema = Folder() + "/cdf.xsd";
        if (again.ValidateXMLFileWithLocaleXSD(CComBSTR(input.c_str()), CComBSTR(schema.c_str()))
                .Length() != 0)
            return 0;
        Fail("written file does not load: " + message.ToString());
    }
    SameTree(first, second);
    return 0;
}
