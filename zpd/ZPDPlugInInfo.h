#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "platform/value/Value.h"

// A plug-in's information dictionary, and what requests read of it again and again. Made by the
// record when the registry has news, never changed, shared by whoever is reading; any thread.
class ZPDPlugInInfo {
public:
    explicit ZPDPlugInInfo(platform::Dictionary dictionary);
    ZPDPlugInInfo(const ZPDPlugInInfo&) = delete;
    ZPDPlugInInfo& operator=(const ZPDPlugInInfo&) = delete;

    [[nodiscard]] const platform::Dictionary& dictionary() const { return dictionary_; }

    // Entries of the dictionary, of its "HXExtension" dictionary, of the attributes in that one.
    [[nodiscard]] const platform::Value* infoKey(std::string_view key) const;
    [[nodiscard]] const platform::Value* pluginKey(std::string_view key) const;
    [[nodiscard]] const platform::Value* attribute(std::string_view key) const;
    // What a rule with this key is about: the attribute, else the entry of the dictionary.
    [[nodiscard]] const platform::Value* property(std::string_view key) const;

    [[nodiscard]] const std::optional<std::string>& version() const { return version_; }

    [[nodiscard]] bool isDedicated() const { return isDedicated_; }

    // The entitlement that a host must have.
    [[nodiscard]] const platform::Value* hostEntitlement() const { return hostEntitlement_; }

private:
    [[nodiscard]] const platform::Value* entryOf(std::string_view property) const;

    const platform::Dictionary dictionary_;
    const platform::Dictionary* plugIn_;     // within dictionary_; or none
    const platform::Dictionary* attributes_; // within plugIn_; or none
    const platform::Value* hostEntitlement_;
    std::optional<platform::Value> extensionPoint_; // nearly every rule dictionary asks for it
    std::optional<std::string> version_;
    bool isDedicated_;
};
