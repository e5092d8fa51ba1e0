#pragma once

namespace platform {
class Assertions;
class CodeSigning;
class Consent;
class Containers;
class Jobs;
class Locale;
class Notifications;
class Preferences;
class Processes;
class Sandbox;
class Types;
} // namespace platform

class ARApplicationWorkspace;

// The services of the operating system that the daemon stands on, each behind its interface, and
// the registry. Made by main (or a test), which owns the services: they outlive the server and
// every record. A plain value.
struct Platform {
    platform::Processes& processes;
    platform::CodeSigning& signing;
    platform::Sandbox& sandbox;
    platform::Types& types;
    platform::Preferences& preferences;
    platform::Notifications& notifications;
    platform::Containers& containers;
    platform::Locale& locale;
    platform::Jobs& jobs;
    platform::Assertions& assertions;
    platform::Consent& consent;
    ARApplicationWorkspace& workspace;
};
