#include "remote/remote_dir.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "remote/daemon_config.h"
#include "remote/ssh_login.h"

#include <cstdio>
#include <unistd.h>

namespace bakjob
{

namespace
{

// The first path line behind the module's header, even behind another header.
std::optional<std::string> module_folder(const std::string &local_copy, const std::string &module)
{
    bool in_section = false;
    std::optional<std::string> folder;
    read_daemon_config(local_copy, [&](const std::string &line) {
        if (in_section) {
            folder = path_of_line(line);
        } else {
            in_section = section_name(line) == module;
        }
        return !folder;
    });
    return folder;
}

int make_remote_dir(const std::string &folder, const std::string &target)
{
    // The folder is the remote side's own word for it.
    if (!folder.starts_with('/')) {
        DebugLog("ERROR: module path refused: not absolute\n");
        return -1;
    }
    const auto safe_folder = shell_path("module path", folder);
    const auto safe_target = shell_path("remote folder", target);
    if (!safe_folder || !safe_target) return -1;
    return rsync_remote_exec(in_single_quotes(
        format_text("(cd %s;umask 000 ;mkdir  -p %s)", safe_folder->c_str(), safe_target->c_str())));
}

} // namespace

std::optional<std::string> rsync_find_module_folder(const JobName &job, const std::string &module)
{
    const std::string local_copy = remote_config_copy(job);
    std::remove(local_copy.c_str());
    if (!fetch_daemon_config(local_copy)) return std::nullopt;
    auto folder = module_folder(local_copy, module);
    std::remove(local_copy.c_str());
    sync();
    return folder;
}

int rsync_prepare_remote_dir(const JobName &job, const std::string &module, const std::string &first,
                             const std::string &second)
{
    const auto folder = rsync_find_module_folder(job, module);
    return folder ? make_remote_dir(*folder, first + '/' + second) : -1;
}

} // namespace bakjob
