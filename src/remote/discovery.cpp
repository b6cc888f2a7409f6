#include "remote/discovery.h"

#include "common/debug_log.h"
#include "common/job_files.h"
#include "common/shell.h"
#include "common/text.h"
#include "config/config_lock.h"
#include "config/current_job.h"
#include "config/remote_modules.h"
#include "remote/daemon_config.h"
#include "remote/daemon_probe.h"
#include "remote/sizes.h"
#include "remote/ssh_login.h"

#include <cstdio>
#include <unistd.h>

namespace bakjob
{

namespace
{

constexpr int MAX_MODULES = 1024;
constexpr int MAX_LINES = 4 * MAX_MODULES; // of a listing, which may never end

void clear_list()
{
    rsync_free_modules();
    *module_list = {};
}

void measure_remote_side(const RsyncJob &job)
{
    if (job.backup_type == BACKUP_PUSH) {
        measure_remote_free_space(job, module_list->remote_free);
        return;
    }
    for (RemoteModule *module = module_list->head; module != nullptr; module = module->next) {
        measure_remote_folder(job, module->path, module->du_size);
    }
}

void measure_this_device(const RsyncJob &job)
{
    for (int i = 0; i < VOLUMES; ++i) {
        const std::string mount_point = std::string(VOLUMES_FOLDER) + VOLUME_NAMES[i];
        if (access(mount_point.c_str(), F_OK) == 0) {
            rsync_local_free_space(VOLUME_NAMES[i], module_list->local_free[i]);
        }
    }
    if (was_cut(job, "local_path")) {
        copy_text(module_list->local_size, UNKNOWN_SIZE);
        return;
    }
    std::string folders = job.local_path; // is split in place
    rsync_local_du(folders.data(), module_list->local_size);
}

} // namespace

void add_found_module(const std::string &name, const std::string &path)
{
    RemoteModule module{};
    if (!copy_text(module.name, name) || !copy_text(module.path, path)) {
        DebugLog("ERROR: remote module skipped: name or path too long\n");
    } else if (module_list->count == MAX_MODULES) {
        DebugLog("ERROR: remote module skipped: more than %d\n", MAX_MODULES);
    } else {
        copy_text(module.du_size, "0");
        rsync_add_module(module);
    }
}

bool add_configured_modules(const std::string &local_copy)
{
    std::string name;
    std::string path;
    const auto add_if_whole = [&] {
        if (name.empty() || path.empty()) return;
        add_found_module(name, path);
        name.clear();
        path.clear();
    };
    const bool read = read_daemon_config(local_copy, [&](const std::string &line) {
        add_if_whole();
        if (const auto folder = path_of_line(line)) {
            path = *folder;
        } else if (const auto section = section_name(line)) {
            name = *section;
        }
        return true;
    });
    add_if_whole();
    return read;
}

std::string module_of_listing_line(std::string line)
{
    trim_right(line);
    const std::size_t tab = line.find('\t');
    if (tab != std::string::npos) {
        line.resize(tab);
        line.resize(line.find_last_not_of(' ') + 1);
    }
    return line;
}

namespace
{

// Whether the configuration could be had.
bool find_configured_modules(const RsyncJob &job)
{
    // The copy has one name for all: another discovery must not take it away, nor be given ours.
    const UniqueFd lock = rsync_lock_config(DISCOVERY_LOCK_FILE);
    if (fetch_daemon_config(job, DISCOVERY_CONFIG_COPY).why) return false;
    const bool read = add_configured_modules(DISCOVERY_CONFIG_COPY);
    std::remove(DISCOVERY_CONFIG_COPY);
    sync();
    return read;
}

} // namespace

void discover_remote(const RsyncJob &job)
{
    if (job.server_type == SERVER_ANY) {
        list_daemon_modules(job);
        return;
    }
    clear_list();
    if (job.backup_type == BACKUP_PULL && job.rsync_mode == RSYNC_MODE_SHELL) {
        measure_remote_folder(job, job.remote_path, module_list->remote_size);
        return;
    }
    if (!find_configured_modules(job)) return;
    measure_remote_side(job);
    measure_this_device(job);
}

int list_daemon_modules(const RsyncJob &job)
{
    clear_list();
    measure_this_device(job);
    const auto command = module_list_command(job);
    if (!command) return 0;
    ShellReader reply(*command);
    if (!reply.started()) return 0;
    std::string line;
    for (int lines = 0; lines < MAX_LINES && reply.read_line(line); ++lines) {
        add_found_module(module_of_listing_line(line), "");
    }
    return reply.close();
}

RemoteReplyCode check_remote_secret(const RsyncJob &job)
{
    char expected[PASSWORD_SIZE] = "";
    if (job.pwd_encoded != 0) {
        copy_text(expected, job.rsync_pwd);
    } else if (password_encode(expected, job.rsync_pwd, sizeof expected) < 0) {
        return REPLY_AUTH_FAILED;
    }
    const auto command =
        ssh_command(job, SshLogin::AS_CLIENT, "cat /etc/rsyncd.secrets 2>/dev/null | grep root:");
    if (!command) return REPLY_AUTH_FAILED;
    ShellReader reply(*command);
    std::string line;
    reply.read_line(line);
    reply.close();
    trim_right(line);
    constexpr std::string_view USER = "root:";
    const std::size_t user = line.find(USER);
    const bool matches = user != std::string::npos && line.substr(user + USER.size()) == expected;
    return matches ? REPLY_OK : REPLY_AUTH_FAILED;
}

void rsync_discover_remote()
{
    discover_remote(CurrentJob);
}

int rsync_list_daemon_modules()
{
    return list_daemon_modules(CurrentJob);
}

RemoteReplyCode rsync_check_remote_secret()
{
    return check_remote_secret(CurrentJob);
}

} // namespace bakjob
