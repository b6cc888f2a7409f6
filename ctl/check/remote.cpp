// remote: what the remote side of a job offers, and sizes on both sides.

#include "check/commands.h"
#include "check/probe.h"
#include "config/current_job.h"
#include "config/remote_modules.h"
#include "jobs/jobs.h"
#include "output/failure.h"
#include "output/output.h"
#include "remote/discovery.h"
#include "remote/sizes.h"

#include <cstdio>
#include <nlohmann/json.hpp>

namespace bakjob::ctl
{

namespace
{

bool is_measured(const SizeText &size)
{
    const std::string_view text = size;
    return !text.empty() && text != UNKNOWN_SIZE;
}

// Nobody has measured the folder of a module that is only known by its name.
bool is_measured(const RemoteModule &module)
{
    return *module.path != '\0' && is_measured(module.du_size);
}

// A daemon lists its modules to everybody; where they lie and how large they are takes a login, as jobs for
// an appliance of the same kind use it. False when it is not let in.
bool measure_modules(RsyncJob job)
{
    const bool let_in = try_login(job, SshLogin::AS_CLIENT).result == SSH_OK;
    if (let_in) {
        job.server_type = SERVER_SAME_KIND;
        discover_remote(job);
    }
    if (!let_in || rsync_module_list_empty() == 1) list_daemon_modules(job);
    if (!let_in) return false;
    // Each direction asks for what it needs alone.
    if (job.backup_type == BACKUP_PULL) {
        measure_remote_free_space(job, module_list->remote_free);
        return true;
    }
    for (RemoteModule *module = module_list->head; module != nullptr; module = module->next) {
        if (*module->path != '\0') measure_remote_folder(job, module->path, module->du_size);
    }
    return true;
}

bool measure_path(const RsyncJob &job)
{
    list_daemon_modules(job);
    const auto login = ssh_login_of(job);
    if (!login || try_login(job, *login).result != SSH_OK) return false;
    measure_remote_folder(job, job.remote_path, module_list->remote_size);
    measure_remote_free_space(job, module_list->remote_free);
    return true;
}

// Whether the sizes over there could be asked for.
bool discover(const RsyncJob &job)
{
    const DaemonAnswer reply = ask_daemon(job);
    if (reply.result != REPLY_OK) {
        throw Failure("the rsync daemon cannot be asked: " + printable(reply.line));
    }
    return job.rsync_mode == RSYNC_MODE_DAEMON ? measure_modules(job) : measure_path(job);
}

Json size(const SizeText &text)
{
    return is_measured(text) ? Json(text) : Json(nullptr);
}

Json volumes(const SizeText (&free)[VOLUMES])
{
    Json json = Json::object();
    for (int i = 0; i < VOLUMES; ++i) {
        if (is_measured(free[i])) json[VOLUME_NAMES[i]] = free[i];
    }
    return json;
}

Json modules()
{
    Json list = Json::array();
    for (const RemoteModule *module = module_list->head; module != nullptr; module = module->next) {
        list.push_back({{"name", module->name},
                        {"path", module->path},
                        {"size", is_measured(*module) ? Json(module->du_size) : Json(nullptr)}});
    }
    return list;
}

void print_volumes(const char *where, const SizeText (&free)[VOLUMES])
{
    for (int i = 0; i < VOLUMES; ++i) {
        if (!is_measured(free[i])) continue;
        std::printf("free %s, %s: %s\n", where, VOLUME_NAMES[i], printable(free[i]).c_str());
    }
}

void print_text()
{
    std::vector<Row> rows;
    for (const RemoteModule *module = module_list->head; module != nullptr; module = module->next) {
        rows.push_back({module->name, *module->path == '\0' ? "?" : module->path,
                        is_measured(*module) ? module->du_size : "?"});
    }
    if (!rows.empty()) print_table({"MODULE", "FOLDER", "SIZE"}, rows);
    print_volumes("on the remote side", module_list->remote_free);
    print_volumes("here", module_list->local_free);
    const auto print_size = [](const char *what, const SizeText &text) {
        if (is_measured(text)) std::printf("%s: %s\n", what, printable(text).c_str());
    };
    print_size("remote_path holds", module_list->remote_size);
    print_size("the local folders hold", module_list->local_size);
}

} // namespace

int show_remote(const Request &request)
{
    const bool measured = discover(rsync_with_defaults(read_job(request.name).record));
    if (request.json) {
        print_json({{"modules", modules()},
                    {"remote_free", volumes(module_list->remote_free)},
                    {"remote_size", size(module_list->remote_size)},
                    {"local_free", volumes(module_list->local_free)},
                    {"local_size", size(module_list->local_size)}});
    } else {
        print_text();
        if (!measured) std::puts("Folders and sizes over there take an ssh login, which is not let in.");
    }
    return EXIT_FINE;
}

} // namespace bakjob::ctl
