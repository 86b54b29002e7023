#pragma once
// Compiled XSD schemas shared between the schema collection and the validation entry points.
// Private to the platform layer: libxml2 stays behind the opaque CompiledSchema.

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "HttpClient.h"
#include "SchemaUri.h"
#include "SchemaValidation.h"

namespace kest {
namespace detail {

/// A compiled schema. Read-only once built, so any number of validations may use it at once.
class CompiledSchema;
using CompiledSchemaHandle = std::shared_ptr<const CompiledSchema>;

/// Result of loading a schema: the schema, or a failure with its reason.
struct SchemaLoad {
    CompiledSchemaHandle schema;
    ValidationOutcome failure;
};

/// Compiles the schema at a resolved location, or takes it from the process-wide cache (local
/// files by path, modification time and size; http(s) URLs for the process lifetime). An http
/// location, or an http include inside a schema, fails unless `allowHttp`.
SchemaLoad LoadSchema(const std::string& resolvedLocation, bool allowHttp);

/// Compiles one schema that imports every (namespace, resolved location) pair, for documents
/// that name several schemas; cached like LoadSchema.
SchemaLoad LoadCombinedSchema(const std::vector<SchemaRef>& resolvedRefs, bool allowHttp);

/// Compiles a schema from text (not cached); `name` stands for it in messages.
SchemaLoad LoadSchemaText(const std::string& name, const std::string& text);

/// The library's own copy of cdf.xsd, compiled once (empty if it does not compile).
const CompiledSchemaHandle& BuiltinCdfSchema();

/// The target namespace of a compiled schema ("" when it has none).
std::string SchemaTargetNamespace(const CompiledSchema& schema);

/// Validates document bytes against a compiled schema. No network access and no external
/// entity is read while the document is parsed.
ValidationOutcome ValidateWithSchema(const CompiledSchema& schema, std::string_view document,
                                     const std::string& documentUrl);

/// The limits of every http(s) fetch of a schema document (process-wide; 30 s, 64 MB and 5
/// redirects unless changed). The bytes limit also bounds one schema with all its includes.
HttpLimits SchemaFetchLimits();
void SetSchemaFetchLimits(const HttpLimits& limits);

}  // namespace detail
}  // namespace kest
