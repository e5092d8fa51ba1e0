#include "launcher/ProgramText.h"

#include <string_view>
#include <utility>

#include "platform/jobs/LauncherProtocol.h"

ProgramText::ProgramText(std::vector<std::string> texts) : texts_(std::move(texts)) {
    pointers_.reserve(texts_.size() + 1);
    for (std::string& text : texts_)
        pointers_.push_back(text.data());
    pointers_.push_back(nullptr);
}

std::vector<std::string> ProgramText::environment(const platform::Dictionary& variables) {
    namespace launcher = platform::launcher;
    std::vector<std::string> texts;
    texts.reserve(variables.size() + 1);
    for (const auto& [name, value] : variables) {
        if (name.view() != launcher::socketVariable)
            texts.push_back(std::string(name.view()) + "=" + std::string(value.string().value()));
    }
    texts.push_back(std::string(launcher::socketVariable) + "=" +
                    std::to_string(launcher::socketDescriptor));
    return texts;
}
