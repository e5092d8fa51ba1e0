#pragma once

#include <optional>

#include "platform/value/Value.h"

namespace platform {
class Assertions;
class Consent;
class Jobs;
class Sandbox;
class Types;
} // namespace platform

class ARApplicationWorkspace;
class ZPDKeyPool;
class ZPDPlugIn;

// Where a record's stored annotation is looked up: the database.
class ZPDAnnotationSource {
public:
    virtual ~ZPDAnnotationSource() = default;
    [[nodiscard]] virtual std::optional<platform::Dictionary>
    annotationForPlugIn(const ZPDPlugIn& plugIn) = 0;
};

// What the daemon's records need of the world around them. Owned by the database, shared by all
// its records, which it outlives.
struct ZPDPlugInContext {
    ARApplicationWorkspace& workspace;
    platform::Sandbox& sandbox;
    platform::Types& types;
    ZPDAnnotationSource& annotations;
    ZPDKeyPool& keys;
    platform::Jobs& jobs;
    platform::Assertions& assertions;
    platform::Consent& consent;
};
