#include "Document.h"

#include <cstdio>
#include <utility>

#include "../model/KestCdfCalData.h"
#include "../platform/Automation.h"

namespace kest {
namespace ops {

namespace {

std::string Text(const KestCdfNormalizedString& text) { return text.m_string.ToString(); }

std::optional<std::string> Nullable(const CComBSTR& text) {
    if (text == nullptr) return std::nullopt;
    return text.ToString();
}
std::optional<std::string> Nullable(const KestCdfNormalizedString& text) {
    return Nullable(text.m_string);
}

CComBSTR Bstr(const std::optional<std::string>& text) {
    return text ? CComBSTR(*text) : CComBSTR();
}
KestCdfNormalizedString Normalized(const std::string& text) {
    return KestCdfNormalizedString(CComBSTR(text));
}
KestCdfNormalizedString Normalized(const std::optional<std::string>& text) {
    return KestCdfNormalizedString(Bstr(text));
}

Value FromVariant(const VARIANT& element) {
    switch (element.vt) {
        case VT_EMPTY:
            return Value();
        case VT_I4:
            return Value::Integer(element.lVal);
        case VT_I2:
            return Value::Integer(element.iVal);
        case VT_BOOL:
            return Value::Integer(element.boolVal);
        case VT_R8:
            return Value::Double(element.dblVal);
        case VT_R4:
            return Value::Double(element.fltVal);
        case VT_BSTR:
            return Value::String(Utf16ToUtf8(BstrView(element.bstrVal)));
        default:
            break;
    }
    _variant_t text;
    if (FAILED(VariantChangeType(&text, &element, 0, VT_BSTR))) return Value();
    return Value::String(Utf16ToUtf8(BstrView(text.bstrVal)));
}

// Reads the elements of a stored value; a value that is no array reads as absent.
ValueList FromStored(const _variant_t& stored) {
    ValueList list;
    if (stored.vt != (VT_ARRAY | VT_VARIANT) || !stored.parray) return list;
    SAFEARRAY* array = stored.parray;
    void* data = nullptr;
    ThrowIfFailed(SafeArrayAccessData(array, &data));
    const VARIANT* elements = static_cast<const VARIANT*>(data);
    const ULONG count = array->rgsabound[0].cElements;
    try {
        list.elements.reserve(count);
        for (ULONG i = 0; i < count; ++i) list.elements.push_back(FromVariant(elements[i]));
    } catch (...) {
        SafeArrayUnaccessData(array);
        throw;
    }
    SafeArrayUnaccessData(array);
    list.present = true;
    return list;
}

_variant_t ToStored(const ValueList& list) {
    _variant_t stored;
    if (!list.present) return stored;
    SAFEARRAY* array =
        SafeArrayCreateVector(VT_VARIANT, 0, static_cast<ULONG>(list.elements.size()));
    if (!array) throw _com_error(E_OUTOFMEMORY);
    stored.vt = VT_ARRAY | VT_VARIANT;
    stored.parray = array;
    void* data = nullptr;
    ThrowIfFailed(SafeArrayAccessData(array, &data));
    VARIANT* elements = static_cast<VARIANT*>(data);
    bool outOfMemory = false;
    for (std::size_t i = 0; i < list.elements.size(); ++i) {
        const Value& value = list.elements[i];
        VARIANT& element = elements[i];
        switch (value.GetKind()) {
            case Value::Kind::kEmpty:
                break;
            case Value::Kind::kInteger:
                element.vt = VT_I4;
                element.lVal = value.Integer();
                break;
            case Value::Kind::kDouble:
                element.vt = VT_R8;
                element.dblVal = value.Number();
                break;
            case Value::Kind::kString:
                element.bstrVal = SysAllocStringFromUtf8(value.Text());
                if (element.bstrVal)
                    element.vt = VT_BSTR;
                else
                    outOfMemory = true;
                break;
        }
    }
    SafeArrayUnaccessData(array);
    if (outOfMemory) throw _com_error(E_OUTOFMEMORY);
    return stored;
}

// The first `count` elements of a child array the tree refers to (none for a null array or a
// negative count).
template <typename T>
int Count(const T* array, int count) {
    return array && count > 0 ? count : 0;
}

Item FromCalItem(const KestCdfCalItem& source) {
    Item item;
    item.name = Nullable(source.GetName());
    item.annotation = Nullable(source.GetAnnotation());
    item.note = Nullable(source.GetNote());
    // The values are read in place: a copy of each array would cost as much as the rest.
    if (const KestCdfCalItemValue* value = source.PeekCalItemValue()) {
        item.units = Text(value->GetUnits());
        item.format = Text(value->GetFormatType());
        item.values = FromStored(value->PeekValue());
    }
    const KestCdfAxis* axes = source.GetAxis();
    const int axisCount = Count(axes, source.GetAxisSize());
    item.axes.reserve(static_cast<std::size_t>(axisCount));
    for (int i = 0; i < axisCount; ++i) {
        Axis axis;
        axis.size = static_cast<std::int32_t>(axes[i].GetSize());
        axis.units = Text(axes[i].GetSwUnits());
        axis.format = Text(axes[i].GetFormatType());
        axis.points = FromStored(axes[i].PeekAxisValue());
        item.axes.push_back(std::move(axis));
    }
    return item;
}

CalList FromCalList(const KestCdfCalList& source) {
    CalList list;
    list.name = Nullable(source.GetName());
    list.note = Nullable(source.GetNote());
    try {
        const KestCdfSymbolicFile file = source.GetSymbolicFile();
        list.symbolicFile =
            FileRef{Text(file.GetSymbolicFile()), static_cast<std::uint32_t>(file.GetCrc())};
    } catch (const _com_error& error) {
        if (error.Error() != E_POINTER) throw;
    }
    try {
        const KestCdfTargetImage image = source.GetTargetImage();
        list.targetImage =
            FileRef{Text(image.GetTargetImage()), static_cast<std::uint32_t>(image.GetCrc())};
    } catch (const _com_error& error) {
        if (error.Error() != E_POINTER) throw;
    }
    const KestCdfCalItem* items = source.GetCalItems();
    const int itemCount = Count(items, source.GetCalItemSize());
    list.items.reserve(static_cast<std::size_t>(itemCount));
    for (int i = 0; i < itemCount; ++i) list.items.push_back(FromCalItem(items[i]));
    return list;
}

void ToCalItem(const Item& item, KestCdfCalItem& target) {
    target.SetName(Normalized(item.name));
    target.SetAnnotation(Bstr(item.annotation));
    target.SetNote(Bstr(item.note));
    if (item.HasValue()) {
        KestCdfCalItemValue* value = target.CreateCalItemValue();
        value->SetUnits(Normalized(*item.units));
        value->SetFormatType(Normalized(item.format.value_or(std::string())));
        if (item.values.present) value->SetValueElements(ToStored(item.values));
    }
    if (!item.axes.empty()) {
        KestCdfAxis* axes = target.CreateAxisArray(static_cast<int>(item.axes.size()));
        for (std::size_t i = 0; i < item.axes.size(); ++i) {
            const Axis& axis = item.axes[i];
            axes[i].SetSize(static_cast<unsigned int>(axis.size));
            axes[i].SetSwUnits(Normalized(axis.units));
            axes[i].SetFormatType(Normalized(axis.format));
            if (axis.points.present) axes[i].SetAxisElements(ToStored(axis.points));
        }
    }
    target.SetAxisSize(static_cast<int>(item.axes.size()));
}

}  // namespace

std::size_t Document::ItemCount() const noexcept {
    std::size_t count = 0;
    for (const CalList& list : lists) count += list.items.size();
    return count;
}

Document FromCalData(const KestCdfCalData& data) {
    Document document;
    document.ns = Text(data.GetNamespace());
    document.schemaInstance = Nullable(data.GetSchemaInstance());
    document.schemaLocation = Nullable(data.GetSchemaLocation());
    document.fileName = Text(data.GetFileName());
    document.company = Nullable(data.GetCompany());
    document.note = Nullable(data.GetNote());

    const KestCdfChangeHistory history = data.GetChangeHistory();
    const KestCdfChange* changes = history.GetChange();
    const int changeCount = Count(changes, history.GetChangeArraySize());
    for (int i = 0; i < changeCount; ++i) {
        const KestCdfChange& source = changes[i];
        Change change;
        change.user = Text(source.GetUserNameW());
        change.date = source.GetDate().CreateTimeString().ToString();
        change.tool = Nullable(source.GetTool());
        change.note = Nullable(source.GetNote());
        change.dataVersion = Nullable(source.GetDataVersion());
        document.history.push_back(std::move(change));
    }

    const KestCdfCalList* lists = data.GetCalLists();
    const int listCount = Count(lists, data.GetCalListSize());
    document.lists.reserve(static_cast<std::size_t>(listCount));
    for (int i = 0; i < listCount; ++i) document.lists.push_back(FromCalList(lists[i]));
    return document;
}

KestCdfCalData ToCalData(const Document& document) {
    KestCdfCalData data;
    data.SetNamespace(Normalized(document.ns));
    data.SetSchemaInstance(Normalized(document.schemaInstance));
    data.SetSchemaLocation(Normalized(document.schemaLocation));
    data.SetFileName(Normalized(document.fileName));
    data.SetCompany(Normalized(document.company));
    data.SetNote(Bstr(document.note));

    KestCdfChangeHistory history;
    history.SetChangeArraySize(static_cast<int>(document.history.size()));
    if (!document.history.empty()) {
        KestCdfChange* changes = history.CreateChangeList();
        for (std::size_t i = 0; i < document.history.size(); ++i) {
            const Change& change = document.history[i];
            changes[i].SetUserName(Normalized(change.user));
            KestCdfDate date;
            date.SetDate(CComBSTR(change.date));
            changes[i].SetDate(date);
            changes[i].SetTool(Bstr(change.tool));
            changes[i].SetNote(Bstr(change.note));
            changes[i].SetDataVersion(Normalized(change.dataVersion));
        }
    }
    data.SetChangeHistory(history);

    data.SetCalListSize(static_cast<int>(document.lists.size()));
    if (!document.lists.empty()) {
        KestCdfCalList* lists = data.CreateCalList(static_cast<int>(document.lists.size()));
        for (std::size_t i = 0; i < document.lists.size(); ++i) {
            const CalList& list = document.lists[i];
            KestCdfCalList& target = lists[i];
            target.SetName(Normalized(list.name));
            target.SetNote(Bstr(list.note));
            if (list.symbolicFile) {
                KestCdfSymbolicFile* file = target.CreateSymbolicFile();
                file->SetSymbolicFile(Normalized(list.symbolicFile->name));
                file->SetCrc(static_cast<int>(list.symbolicFile->crc));
            }
            if (list.targetImage) {
                KestCdfTargetImage* image = target.CreateTargetImage();
                image->SetTargetImage(Normalized(list.targetImage->name));
                image->SetCrc(static_cast<int>(list.targetImage->crc));
            }
            target.SetCalItemSize(static_cast<int>(list.items.size()));
            KestCdfCalItem* items = target.CreateCalItems();
            for (std::size_t j = 0; j < list.items.size(); ++j) ToCalItem(list.items[j], items[j]);
        }
    }
    return data;
}

}  // namespace ops
}  // namespace kest
