// The schema collection behind "Msxml2.XMLSchemaCache.4.0": compiled XSD schemas keyed by
// their target namespace, in the order they were added.

#include <mutex>
#include <string>
#include <vector>

#include "IXMLDOMDocument.h"
#include "IXMLDOMSchemaCollection.h"
#include "detail/SchemaValidation.h"
#include "detail/XsdSchema.h"

namespace kest {
namespace detail {
namespace {

class XMLSchemaCollection final : public IXMLDOMSchemaCollection {
  public:
    struct Entry {
        std::string namespaceURI;
        std::string location;  // resolved path or URL
        CompiledSchemaHandle schema;
    };

    void add(const _bstr_t& namespaceURI, const _variant_t& location) override {
        if (location.vt != VT_BSTR)
            throw _com_error(E_INVALIDARG, "the schema location must be a path or URL string");
        std::string ns = namespaceURI.ToString();
        std::string written = _bstr_t(location.bstrVal).ToString();
        std::string resolved, error;
        // Relative paths are taken against the current directory.
        if (!ResolveSchemaLocation(written, std::string(), resolved, error))
            throw _com_error(E_FAIL, error);
        SchemaLoad load = LoadSchema(resolved, m_allowHttp);
        if (!load.schema) throw _com_error(E_FAIL, load.failure.reason);
        std::string target = SchemaTargetNamespace(*load.schema);
        if (target != ns) {
            throw _com_error(E_FAIL, "schema " + resolved + " has target namespace '" + target +
                                         "', not the namespace '" + ns + "' it is added for");
        }
        std::lock_guard<std::mutex> lock(m_mutex);
        for (Entry& entry : m_entries) {
            if (entry.namespaceURI == ns) {
                entry.location = resolved;
                entry.schema = load.schema;
                return;
            }
        }
        m_entries.push_back(Entry{ns, resolved, load.schema});
    }

    long Getlength() override {
        std::lock_guard<std::mutex> lock(m_mutex);
        return static_cast<long>(m_entries.size());
    }

    _bstr_t GetnamespaceURI(long index) override {
        std::lock_guard<std::mutex> lock(m_mutex);
        if (index < 0 || static_cast<std::size_t>(index) >= m_entries.size())
            throw _com_error(E_INVALIDARG, "index " + std::to_string(index) +
                                               " is outside the schema collection");
        return _bstr_t(m_entries[static_cast<std::size_t>(index)].namespaceURI);
    }

    void remove(const _bstr_t& namespaceURI) override {
        std::string ns = namespaceURI.ToString();
        std::lock_guard<std::mutex> lock(m_mutex);
        for (auto it = m_entries.begin(); it != m_entries.end(); ++it) {
            if (it->namespaceURI == ns) {
                m_entries.erase(it);
                return;
            }
        }
    }

    void PutserverHttpRequest(bool allow) override { m_allowHttp = allow; }

    std::vector<Entry> Snapshot() const {
        std::lock_guard<std::mutex> lock(m_mutex);
        return m_entries;
    }

  private:
    mutable std::mutex m_mutex;
    std::vector<Entry> m_entries;
    bool m_allowHttp = true;
};

bool EqualsIgnoringAsciiCase(const OLECHAR* left, const OLECHAR* right) noexcept {
    auto fold = [](OLECHAR c) { return c >= u'A' && c <= u'Z' ? OLECHAR(c - u'A' + u'a') : c; };
    for (; *left && *right; ++left, ++right)
        if (fold(*left) != fold(*right)) return false;
    return *left == *right;
}

}  // namespace

ValidationOutcome ValidateAgainstCollection(std::string_view document,
                                            const std::string& documentUrl,
                                            IXMLDOMSchemaCollection& collection) {
    ValidationOutcome outcome;
    outcome.url = documentUrl;
    auto* schemas = dynamic_cast<XMLSchemaCollection*>(&collection);
    if (!schemas) {
        outcome.code = E_INVALIDARG;
        outcome.reason = "the schema collection was not created by this library";
        return outcome;
    }
    std::vector<XMLSchemaCollection::Entry> entries = schemas->Snapshot();
    if (entries.empty()) {
        outcome.code = XML_E_INVALID;
        outcome.reason = (documentUrl.empty() ? std::string() : documentUrl + ": ") +
                         "the root element has no associated schema: the schema collection "
                         "is empty";
        return outcome;
    }
    if (entries.size() == 1) return ValidateWithSchema(*entries[0].schema, document, documentUrl);
    // libxml2 cannot join compiled schemas, so several namespaces are compiled together.
    std::vector<SchemaRef> refs;
    for (const auto& entry : entries) refs.push_back(SchemaRef{entry.namespaceURI, entry.location});
    SchemaLoad load = LoadCombinedSchema(refs, /*allowHttp=*/true);
    if (!load.schema) return load.failure;
    return ValidateWithSchema(*load.schema, document, documentUrl);
}

}  // namespace detail

HRESULT IXMLDOMSchemaCollection::CreateInstance(const OLECHAR* progId,
                                                IXMLDOMSchemaCollection** result) noexcept {
    if (!result) return E_POINTER;
    *result = nullptr;
    if (!progId) return E_INVALIDARG;
    if (!detail::EqualsIgnoringAsciiCase(progId, kProgIdXMLSchemaCache40))
        return REGDB_E_CLASSNOTREG;
    try {
        *result = new detail::XMLSchemaCollection;
        return S_OK;
    } catch (...) {
        return E_OUTOFMEMORY;
    }
}

bool IXMLDOMSchemaCollection::ValidatorUsable() noexcept { return detail::SchemaValidatorUsable(); }

}  // namespace kest
