#include "platform/probe/Probes.h"

// One semaphore for each probe: a tracer that enables the probe counts it up in this process.
#define _SDT_HAS_SEMAPHORES 1
#include <sys/sdt.h>

// The names are fixed by sys/sdt.h: provider, probe, "semaphore". Tracers find the addresses in
// the notes of the program, so that the section's name is only for people who look.
#define ZPD_PROBE_SEMAPHORE(name)                                                                  \
    __attribute__((section(".probes"), visibility("hidden"),                                       \
                   used)) volatile unsigned short zpd_##name##_semaphore = 0

extern "C" {
ZPD_PROBE_SEMAPHORE(client__new);
ZPD_PROBE_SEMAPHORE(client__done);
ZPD_PROBE_SEMAPHORE(request__input);
ZPD_PROBE_SEMAPHORE(request);
ZPD_PROBE_SEMAPHORE(request__output);
ZPD_PROBE_SEMAPHORE(discover__raw);
ZPD_PROBE_SEMAPHORE(plugin__add);
ZPD_PROBE_SEMAPHORE(plugin__remove);
ZPD_PROBE_SEMAPHORE(plugin__ready);
ZPD_PROBE_SEMAPHORE(db__load);
} // extern "C"

namespace platform::probe {

bool requestInputEnabled() noexcept {
    return zpd_request__input_semaphore != 0;
}

bool requestOutputEnabled() noexcept {
    return zpd_request__output_semaphore != 0;
}

bool pluginReadyEnabled() noexcept {
    return zpd_plugin__ready_semaphore != 0;
}

void clientNew(int pid) noexcept {
    STAP_PROBE1(zpd, client__new, pid);
}

void clientDone(int pid) noexcept {
    STAP_PROBE1(zpd, client__done, pid);
}

void requestInput(int pid, const char* text) noexcept {
    STAP_PROBE2(zpd, request__input, pid, text);
}

void request(int pid, const char* type) noexcept {
    STAP_PROBE2(zpd, request, pid, type);
}

void requestOutput(int pid, const char* text) noexcept {
    STAP_PROBE2(zpd, request__output, pid, text);
}

void discoverRaw(unsigned count) noexcept {
    STAP_PROBE1(zpd, discover__raw, count);
}

void pluginAdd(const char* path) noexcept {
    STAP_PROBE1(zpd, plugin__add, path);
}

void pluginRemove(const char* path, bool resolved) noexcept {
    STAP_PROBE2(zpd, plugin__remove, path, resolved);
}

void pluginReady(const char* uuid) noexcept {
    STAP_PROBE1(zpd, plugin__ready, uuid);
}

void dbLoad(const char* path, std::uint64_t code) noexcept {
    STAP_PROBE2(zpd, db__load, path, code);
}

} // namespace platform::probe
