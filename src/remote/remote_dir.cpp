#include "remote/remote_dir.h"

#include "common/job_files.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/current_job.h"
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

} // namespace

Checked find_module_folder(const RsyncJob &job, const JobName &name, const std::string &module)
{
    const std::string local_copy = remote_config_copy(name);
    std::remove(local_copy.c_str());
    const FetchedConfig fetched = fetch_daemon_config(job, local_copy);
    if (fetched.why) return fetched.why;
    const auto folder = module_folder(local_copy, module);
    std::remove(local_copy.c_str());
    sync();
    if (folder) return *folder;
    if (fetched.exit_code != 0) return Refusal{not_fetched(fetched.exit_code)};
    return Refusal{"/etc/rsyncd.conf over there has no path for the module " + module};
}

MadeFolder make_remote_folder(const RsyncJob &job, const JobName &name, const std::string &module,
                              const std::string &first, const std::string &second)
{
    const Checked folder = find_module_folder(job, name, module);
    if (!folder) return {-1, folder.refusal()};
    // The remote side chose this text.
    if (!folder->starts_with('/')) return {-1, refused("module path", "not absolute")};
    const Checked safe_folder = shell_path("module path", *folder);
    const Checked safe_target = shell_path("remote folder", first + '/' + second);
    if (!safe_folder) return {-1, safe_folder.refusal()};
    if (!safe_target) return {-1, safe_target.refusal()};
    const std::string command =
        format_text("(cd %s;umask 000 ;mkdir  -p %s)", safe_folder->c_str(), safe_target->c_str());
    return {run_remotely(job, in_single_quotes(command)), {}};
}

std::optional<std::string> rsync_find_module_folder(const JobName &job, const std::string &module)
{
    const Checked folder = find_module_folder(CurrentJob, job, module);
    return folder ? std::optional(*folder) : std::nullopt;
}

int rsync_prepare_remote_dir(const JobName &job, const std::string &module, const std::string &first,
                             const std::string &second)
{
    return make_remote_folder(CurrentJob, job, module, first, second).status;
}

} // namespace bakjob
