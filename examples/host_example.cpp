// A host that reads a CDF file, edits it and writes it back.
#include <kest/calmorph.h>

#include <iostream>

using namespace kest;

int main(int argc, char** argv) {
    if (argc < 3) {
        std::cerr << "usage: host_example IN.cdf OUT.cdf\n";
        return 1;
    }
    try {
        KestCalmorph converter;
        CComBSTR message;
        KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(argv[1]), true, message);
        if (message.Length() != 0) {
            std::cerr << argv[1] << ": " << message.ToString() << "\n";
            return 2;
        }
        KestCdfCalList* lists = data.GetCalLists();
        for (int i = 0; i < data.GetCalListSize(); ++i) {
            std::cout << lists[i].GetName().ToString() << ": " << lists[i].GetCalItemSize()
                      << " items\n";
        }
        data.SetNote(CComBSTR("checked by host_example"));
        if (!converter.ConvertCPPToXML(data, CComBSTR(argv[2]),
                                       CComBSTR("written by host_example"))) {
            return 3;
        }
    } catch (const KestCalmorphDLLError& e) {
        std::cerr << "conversion failed: reason " << e.GetReason() << " "
                  << e.GetReasonString().ToString() << "\n";
        return 4;
    } catch (const _com_error& e) {
        std::cerr << "platform failure: " << e.ErrorMessage() << "\n";
        return 5;
    }
    return 0;
}
