// remote: what the remote side of a job offers, and sizes on both sides.

#include "commands.h"
#include "config/current_job.h"
#include "config/remote_modules.h"
#include "failure.h"
#include "jobs.h"
#include "output.h"
#include "remote/discovery.h"

#include <cstdio>

namespace bakjob::ctl
{

namespace
{

Json volumes(const SizeText (&free)[VOLUMES])
{
    Json json = Json::object();
    for (int i = 0; i < VOLUMES; ++i) {
        if (*free[i] != '\0') json[VOLUME_NAMES[i]] = free[i];
    }
    return json;
}

Json modules()
{
    Json list = Json::array();
    for (const RemoteModule *module = module_list->head; module != nullptr; module = module->next) {
        list.push_back({{"name", module->name}, {"path", module->path}, {"size", module->du_size}});
    }
    return list;
}

void print_volumes(const char *where, const SizeText (&free)[VOLUMES])
{
    for (int i = 0; i < VOLUMES; ++i) {
        if (*free[i] != '\0')
            std::printf("free %s, %s: %s\n", where, VOLUME_NAMES[i], printable(free[i]).c_str());
    }
}

void print_text()
{
    std::vector<Row> rows;
    for (const RemoteModule *module = module_list->head; module != nullptr; module = module->next) {
        rows.push_back({module->name, module->path, module->du_size});
    }
    if (!rows.empty()) print_table({"MODULE", "FOLDER", "SIZE"}, rows);
    print_volumes("on the remote side", module_list->remote_free);
    print_volumes("here", module_list->local_free);
    const auto print_size = [](const char *what, const SizeText &size) {
        if (*size != '\0') std::printf("%s: %s\n", what, printable(size).c_str());
    };
    print_size("remote_path holds", module_list->remote_size);
    print_size("the local folders hold", module_list->local_size);
}

} // namespace

int show_remote(const Request &request)
{
    RsyncJob job = read_job(request.name).record;
    rsync_prepare_current_job(job);
    rsync_discover_remote();
    if (request.json) {
        print_json({{"modules", modules()},
                    {"remote_free", volumes(module_list->remote_free)},
                    {"remote_size", module_list->remote_size},
                    {"local_free", volumes(module_list->local_free)},
                    {"local_size", module_list->local_size}});
    } else {
        print_text();
    }
    return EXIT_FINE;
}

} // namespace bakjob::ctl
