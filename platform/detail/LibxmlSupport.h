#pragma once
// What the schema compiler and the validator share about libxml2: error capture, the loader
// policy that decides what libxml2 may read, and the scope that installs both on a thread.
// Private to the platform layer; included by its libxml2 units only.

#include <libxml/parser.h>
#include <libxml/xmlerror.h>
#include <libxml/xmlschemas.h>

#include <cstddef>
#include <string>

#include "HttpClient.h"

namespace kest {
namespace detail {

/// A compiled schema. Read-only once built, so any number of validations may use it at once.
class CompiledSchema {
  public:
    CompiledSchema(xmlSchemaPtr schema, std::string location) noexcept
        : m_schema(schema), m_location(std::move(location)) {}
    ~CompiledSchema() { xmlSchemaFree(m_schema); }
    CompiledSchema(const CompiledSchema&) = delete;
    CompiledSchema& operator=(const CompiledSchema&) = delete;

    xmlSchemaPtr Get() const noexcept { return m_schema; }
    const std::string& Location() const noexcept { return m_location; }

  private:
    xmlSchemaPtr m_schema;
    std::string m_location;
};

/// Keeps the first error libxml2 reports (warnings are not failures) and counts the rest.
struct ErrorCollector {
    bool has = false;
    int domain = 0;
    std::string message;
    std::string file;
    long line = 0;
    long column = 0;
    std::size_t count = 0;
};

void CollectError(void* userData, xmlErrorPtr error);

/// "file:line: message", with the fallback file when libxml2 named none.
std::string Located(const ErrorCollector& errors, const std::string& fallbackFile);

/// What libxml2 may read while one of our operations runs on this thread.
struct LoadPolicy {
    bool allowLocalSchemas = false;  // top-level loads of local files (schema documents)
    bool allowHttp = false;          // top-level loads of http(s) schemas, through HttpGet
    HttpLimits limits;               // per fetch
    std::size_t documentsLeft = 0;   // schema documents one compile may still read
    std::size_t bytesLeft = 0;       // bytes one compile may still fetch
    std::string refusal;             // why the first load was refused or failed
};

/// Initialises libxml2 once per process and installs the guarded entity loader.
void InitLibxml();

/// Installs the policy and routes every libxml2 message of this thread to `errors` for the
/// lifetime of the object; restores what was there before.
class LibxmlScope {
  public:
    LibxmlScope(LoadPolicy& policy, ErrorCollector& errors);
    ~LibxmlScope();
    LibxmlScope(const LibxmlScope&) = delete;
    LibxmlScope& operator=(const LibxmlScope&) = delete;

  private:
    LoadPolicy* m_previousPolicy;
    xmlStructuredErrorFunc m_structured;
    void* m_structuredContext;
    xmlGenericErrorFunc m_generic;
    void* m_genericContext;
};

}  // namespace detail
}  // namespace kest
