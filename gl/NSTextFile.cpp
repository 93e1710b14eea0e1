#include "gl/NSTextFile.h"

#include "platform/LocalFile.h"
#include "platform/Log.h"
#include "platform/Resources.h"

#include <algorithm>
#include <utility>

namespace qivo {

namespace {

const char* shown(const char* name) {
    return name ? name : "(null)";
}

/// Empty if the text is ASCII throughout.
std::string objection(const std::string& text) {
    const auto stranger =
        std::find_if(text.begin(), text.end(), [](char byte) { return static_cast<unsigned char>(byte) > 0x7F; });
    if (stranger == text.end()) {
        return {};
    }
    return "Byte " + std::to_string(static_cast<unsigned char>(*stranger)) + " at offset " +
           std::to_string(stranger - text.begin()) + " is not ASCII";
}

} // namespace

bool NSTextFile::_newStringWithFile(const char* path) {
    std::string error;
    auto text = readFile(path, maximumBytes, error);
    if (text) {
        const std::string reason = objection(*text);
        error = reason.empty() ? "" : path + (": " + reason);
    }
    if (!error.empty()) {
        logLine(">> %s", error.c_str());
        return false;
    }
    m_String = std::move(text);
    return true;
}

bool NSTextFile::_newStringWithURL(const char* url) {
    std::string error;
    const auto path = localPath(url, error);
    if (!path) {
        logLine(">> %s", error.c_str());
        return false;
    }
    return _newStringWithFile(path->c_str());
}

bool NSTextFile::_newStringWithResource(const char* name, const char* ext) {
    if (!name || !ext) {
        return false;
    }
    return _newStringWithFile((resourcePath() + "/" + name + "." + ext).c_str());
}

std::unique_ptr<NSTextFile> NSTextFile::initWithURL(const char* url) {
    auto file = std::make_unique<NSTextFile>();
    if (!file->_newStringWithURL(url)) {
        logLine(">> ERROR: Failed acquiring sources from the url <%s>", shown(url));
    }
    return file;
}

std::unique_ptr<NSTextFile> NSTextFile::initWithFile(const char* path) {
    auto file = std::make_unique<NSTextFile>();
    if (!file->_newStringWithFile(path)) {
        logLine(">> ERROR: Failed acquiring sources from the file at pathname \"%s\"", shown(path));
    }
    return file;
}

std::unique_ptr<NSTextFile> NSTextFile::initWithResource(const char* name, const char* ext) {
    auto file = std::make_unique<NSTextFile>();
    if (!file->_newStringWithResource(name, ext)) {
        logLine(">> ERROR: Failed acquiring sources from the \"%s.%s' at application's bunble!", shown(name),
                shown(ext));
    }
    return file;
}

std::shared_ptr<NSTextFile> NSTextFile::textWithURL(const char* url) {
    return initWithURL(url);
}

std::shared_ptr<NSTextFile> NSTextFile::textWithFile(const char* path) {
    return initWithFile(path);
}

std::shared_ptr<NSTextFile> NSTextFile::textWithResource(const char* name, const char* ext) {
    return initWithResource(name, ext);
}

} // namespace qivo
