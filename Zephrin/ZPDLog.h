#pragma once

#include "platform/log/Log.h"

// The log categories of the subsystem "com.tovana.Zephrin". Each accessor returns the same handle
// on every call; it is made with the first call, once, and lives for ever. Any thread.

// Server, connections, transactions, holds, requests in general.
[[nodiscard]] const platform::log::Category& ZPDLogOps();
// The client library's requests and replies, and lists of UUIDs.
[[nodiscard]] const platform::log::Category& ZPDLogTraffic();
// Matching of plug-ins.
[[nodiscard]] const platform::log::Category& ZPDLogExtension();
// Exchanges with the application registry, building and exporting of plug-in records.
[[nodiscard]] const platform::log::Category& ZPDLogAr();
// Code signatures and sandbox extensions.
[[nodiscard]] const platform::log::Category& ZPDLogSandbox();

// Makes the handle of a category. Where there is no memory for one it answers with the default
// log's, so that logging never fails. `category` lives for ever.
[[nodiscard]] const platform::log::Category& ZPDLogCreate(const char* category);
