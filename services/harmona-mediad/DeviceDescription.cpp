#include "services/harmona-mediad/DeviceDescription.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <pugixml.hpp>

#include <cctype>
#include <cerrno>
#include <cstring>

#include "common/io/FileDescriptor.h"
#include "common/util/CleanText.h"
#include "common/util/XmlEscape.h"
#include "platform/plugin/Plugin.h"

namespace harmona::mediad {
namespace {

// The same escaping as the browse library's requests (platform/dma).
using harmona::util::XmlText;

// No description file is near this; a larger one is not ours.
constexpr std::size_t kMaxDataFileBytes = 256 * 1024;

bool IsDirectory(const std::string& path) {
    struct stat st {};
    return stat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

// The whole of a data file, which must be well-formed XML. False with `error` naming the file.
bool ReadDataFile(const std::string& path, std::string& text, std::string& error) {
    const io::FileDescriptor fd(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    struct stat st {};
    if (!fd || fstat(fd.Get(), &st) != 0) {
        error = "cannot read " + path + ": " + std::strerror(errno);
        return false;
    }
    if (!S_ISREG(st.st_mode) || static_cast<std::size_t>(st.st_size) > kMaxDataFileBytes) {
        error = "cannot read " + path + ": not a description file";
        return false;
    }
    text.assign(static_cast<std::size_t>(st.st_size), '\0');
    std::size_t done = 0;
    while (done < text.size()) {
        const ssize_t got = read(fd.Get(), &text[done], text.size() - done);
        if (got < 0 && errno == EINTR)
            continue;
        if (got <= 0) {
            error = "cannot read " + path + ": " + (got < 0 ? std::strerror(errno) : "cut short");
            return false;
        }
        done += static_cast<std::size_t>(got);
    }
    return true;
}

bool IsWellFormed(const std::string& text, const std::string& path, std::string& error) {
    pugi::xml_document document;
    const pugi::xml_parse_result parsed = document.load_buffer(text.data(), text.size());
    if (!parsed)
        error = path + " is not well-formed XML (" + parsed.description() + " at byte " +
                std::to_string(parsed.offset) + ")";
    return static_cast<bool>(parsed);
}

// Replaces the one `mark` in `text` by `value`; false when there is not exactly one.
bool ReplaceMark(std::string& text, const char* mark, const std::string& value) {
    const std::size_t at = text.find(mark);
    const std::size_t length = std::strlen(mark);
    if (at == std::string::npos || text.find(mark, at + length) != std::string::npos)
        return false;
    text.replace(at, length, value);
    return true;
}

bool WriteWholeFile(const std::string& path, const std::string& text) {
    unlink(path.c_str());
    io::FileDescriptor fd(
        open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
    if (!fd)
        return false;
    const bool written =
        write(fd.Get(), text.data(), text.size()) == static_cast<ssize_t>(text.size());
    fchmod(fd.Get(), 0644);  // whatever the umask: the unprivileged server reads it
    return fd.Close() && written;
}

}  // namespace

std::string DescriptionDataFolder() {
    const std::string directory = plugin::ProgramDirectory();
    if (!directory.empty() && IsDirectory(directory + kDataFolderBesideProgram))
        return directory + kDataFolderBesideProgram;
    return HARMONA_MEDIAD_DATA_DIR;
}

std::string MakeUdn() {
    std::string hex;
    const io::FileDescriptor fd(open("/etc/machine-id", O_RDONLY | O_CLOEXEC));
    if (fd) {
        char buffer[64] = {};
        const ssize_t got = read(fd.Get(), buffer, sizeof(buffer) - 1);
        for (ssize_t i = 0; i < got; ++i) {
            if (std::isxdigit(static_cast<unsigned char>(buffer[i])))
                hex += static_cast<char>(std::tolower(static_cast<unsigned char>(buffer[i])));
        }
    }
    if (hex.size() < 32)
        hex = "4861726d6f6e614d6564696144000001";
    hex.replace(0, 8, "4861726d");  // "Harm": differs from other devices of the same machine
    return "uuid:" + hex.substr(0, 8) + "-" + hex.substr(8, 4) + "-" + hex.substr(12, 4) + "-" +
           hex.substr(16, 4) + "-" + hex.substr(20, 12);
}

std::string DefaultFriendlyName() {
    char name[256] = {};
    if (gethostname(name, sizeof(name) - 1) != 0 || name[0] == '\0')
        std::strcpy(name, "storage");
    return std::string("Harmona Music Library (") + name + ")";
}

std::string ChosenFriendlyName(const std::string& configured) {
    std::string name = util::CleanText(configured, util::kPrintableUtf8);
    const std::size_t first = name.find_first_not_of(' ');
    if (first == std::string::npos)
        return DefaultFriendlyName();
    name = util::CleanText(name.substr(first, name.find_last_not_of(' ') + 1 - first),
                           util::kPrintableUtf8, kMaxFriendlyNameBytes);
    return name.substr(0, name.find_last_not_of(' ') + 1);
}

bool FillDescription(const std::string& templateText, const std::string& udn,
                     const std::string& friendlyName, std::string& description,
                     std::string& error) {
    description = templateText;
    for (const auto& [mark, value] : {std::make_pair(kUdnMark, XmlText(udn)),
                                      std::make_pair(kFriendlyNameMark, XmlText(friendlyName))}) {
        if (!ReplaceMark(description, mark, value)) {
            error =
                std::string("the device description template must hold ") + mark + " exactly once";
            return false;
        }
    }
    return true;
}

bool PrepareDescriptions(const std::string& dataFolder, const std::string& runFolder,
                         const std::string& udn, const std::string& friendlyName,
                         DescriptionFiles& files, std::string& error) {
    const std::string templatePath = dataFolder + "/" + kDescriptionTemplateFile;
    const std::string servicesFolder = dataFolder + "/" + kServicesFolder;
    std::string templateText, description, scpd;
    if (!ReadDataFile(templatePath, templateText, error) ||
        !IsWellFormed(templateText, templatePath, error))
        return false;
    if (!FillDescription(templateText, udn, friendlyName, description, error)) {
        error = templatePath + ": " + error;
        return false;
    }
    for (const char* file : {kContentDirectoryScpdFile, kConnectionManagerScpdFile}) {
        const std::string path = servicesFolder + "/" + file;
        if (!ReadDataFile(path, scpd, error) || !IsWellFormed(scpd, path, error))
            return false;
    }
    if (mkdir(runFolder.c_str(), 0755) != 0 && errno != EEXIST) {
        error = "cannot create " + runFolder + ": " + std::strerror(errno);
        return false;
    }
    chmod(runFolder.c_str(), 0755);
    files.descriptionPath = runFolder + "/" + kDescriptionTemplateFile;
    files.servicesFolder = servicesFolder;
    if (!WriteWholeFile(files.descriptionPath, description)) {
        error = "cannot write the device description into " + runFolder;
        return false;
    }
    return true;
}

void RemoveDescriptionFolder(const std::string& runFolder) {
    unlink((runFolder + "/" + kDescriptionTemplateFile).c_str());
    rmdir(runFolder.c_str());
}

}  // namespace harmona::mediad
