// A host that only knows the installed package.
#include <kest/calmorph.h>

#include <iostream>

using namespace kest;

int main() {
    _bstr_t text("grüße");
    CComBSTR copy(text);
    _variant_t number(2.5);
    number.ChangeType(VT_BSTR);
    KestCdfDate date;
    date.SetDate(CComBSTR("2024-05-06T07:08:09"));
    if (copy.Length() != 5 || _bstr_t(number) != _bstr_t("2.5") ||
        _bstr_t(date.CreateTimeString()) != _bstr_t("2024-05-06T07:08:09")) {
        std::cerr << "unexpected values\n";
        return 1;
    }
    std::cout << "consumer ok: " << static_cast<const char*>(text) << "\n";
    return 0;
}
