#pragma once

#include <cstdint>

namespace platform::probe {

// Static trace probes of the provider "zpd" (user-space static probes with semaphores; see
// `readelf -n`). Disabled probes cost one test of a flag. Texts that must be built are built
// only when the probe is enabled. Any thread.
[[nodiscard]] bool requestInputEnabled() noexcept;
[[nodiscard]] bool requestOutputEnabled() noexcept;

void clientNew(int pid) noexcept;
void clientDone(int pid) noexcept;
void requestInput(int pid, const char* text) noexcept;
void request(int pid, const char* type) noexcept;
void requestOutput(int pid, const char* text) noexcept;
void discoverRaw(unsigned count) noexcept;
void pluginAdd(const char* path) noexcept;
void pluginRemove(const char* path, bool resolved) noexcept;
[[nodiscard]] bool pluginReadyEnabled() noexcept;
void pluginReady(const char* uuid) noexcept;
void dbLoad(const char* path, std::uint64_t code) noexcept;

} // namespace platform::probe
