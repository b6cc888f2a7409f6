#include "common/excludes.h"

#include <algorithm>
#include <array>
#include <string_view>

namespace bakjob
{

namespace
{

constexpr std::array NAMES = {
    ".AppleDouble", ".AppleDB",   ".DS_Store",       ".bin",   ".AppleDesktop", "Network Trash Folder",
    ".!@#$recycle", "lost+found", "Nas_Prog",        "Ajaxpf", ".systemfile",   "P2P",
    "aMule",        ".!@$mmc",    ".!@#$tarnelSync", ".zorv"};

// They stand behind two blanks instead of one; the last only where du runs here.
constexpr std::array<std::string_view, 4> SET_OFF = {".DS_Store", "Network Trash Folder", "lost+found",
                                                     ".systemfile"};
constexpr std::string_view SET_OFF_HERE = ".!@#$tarnelSync";

bool is_set_off(std::string_view name, ExcludeForm form)
{
    return std::find(SET_OFF.begin(), SET_OFF.end(), name) != SET_OFF.end() ||
           (form == ExcludeForm::DU_HERE && name == SET_OFF_HERE);
}

std::string option(const std::string &name, ExcludeForm form)
{
    if (form == ExcludeForm::TRANSFER) return "--exclude '" + name + '\'';
    const bool read_twice =
        form == ExcludeForm::DU_REMOTE && name.find_first_of(" !@#$") != std::string::npos;
    return read_twice ? "--exclude=\\''" + name + "'\\'" : "--exclude='" + name + '\'';
}

} // namespace

std::string exclude_options(ExcludeForm form)
{
    std::string options;
    for (const char *const name : NAMES) {
        options += is_set_off(name, form) ? "  " : " ";
        options += option(name, form);
    }
    return options + ' ';
}

} // namespace bakjob
