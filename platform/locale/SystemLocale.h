#pragma once

#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "platform/file/File.h"
#include "platform/file/PathWatch.h"
#include "platform/locale/Locale.h"

namespace platform {

// The locale of the box: LANG in a file of assignments ("locale.conf"), else LANG in the
// environment. Watches the file: the main loop waits for `watchDescriptor` to become readable and
// then calls `handleEvents`, which tells the observer. Made and handled on the main loop;
// `current` may be called from any thread.
class SystemLocale final : public Locale {
public:
    explicit SystemLocale(std::string path);

    [[nodiscard]] std::string current() override;

    void observeChanges(ChangeHandler handler) override { handler_ = std::move(handler); }

    // Non-blocking; -1 when this box has no descriptor to spare: then changes are not seen.
    [[nodiscard]] int watchDescriptor() const { return watch_.descriptor(); }

    // REQUIRES: on the main loop
    void handleEvents();

private:
    // Tells whether the locale is another one.
    bool read();

    const std::string path_;
    PathWatch watch_;
    std::optional<FileStamp> stamp_;
    ChangeHandler handler_;
    std::mutex mutex_;
    std::string current_; // under the mutex
};

// "ll_CC" or "ll" of a locale's name ("de_CH.UTF-8@euro"); empty for "C", "POSIX" and for what is
// not a locale's name.
[[nodiscard]] std::string languageAndRegion(std::string_view localeName);

} // namespace platform
