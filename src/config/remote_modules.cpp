#include "config/remote_modules.h"

#include "common/text.h"

#include <cstdio>
#include <new>

namespace bakjob
{

namespace
{

RemoteModuleList the_list{};

} // namespace

RemoteModuleList *const module_list = &the_list;

int rsync_module_list_empty()
{
    return module_list->count == 0 ? 1 : 0;
}

RemoteModule *rsync_new_module()
{
    return new (std::nothrow) RemoteModule{};
}

RemoteModule *rsync_find_module(std::string_view name)
{
    for (RemoteModule *module = module_list->head; module != nullptr; module = module->next) {
        if (name == module->name) return module;
    }
    return nullptr;
}

void rsync_copy_module(RemoteModule &destination, const RemoteModule &source)
{
    copy_text(destination.name, source.name);
    copy_text(destination.path, source.path);
    copy_text(destination.du_size, source.du_size);
}

RemoteModule *rsync_add_module(const RemoteModule &source)
{
    if (RemoteModule *const present = rsync_find_module(source.name)) return present;
    RemoteModule *const module = rsync_new_module();
    if (module == nullptr) return nullptr;
    module_list->append(module);
    rsync_copy_module(*module, source);
    return module;
}

void rsync_update_module(const RemoteModule &source, std::string_view name)
{
    RemoteModule *const module = rsync_find_module(name);
    if (module != nullptr) rsync_copy_module(*module, source);
}

int rsync_remove_module(RemoteModule *module)
{
    return module != nullptr && module_list->remove(module) ? 1 : 0;
}

void rsync_free_modules()
{
    module_list->clear();
}

void rsync_print_modules()
{
    for (const RemoteModule *module = module_list->head; module != nullptr; module = module->next) {
        std::printf("name \t\t\t: [%s]\npath \t\t\t: [%s]\ndu_size \t\t: [%s]\n", module->name, module->path,
                    module->du_size);
    }
}

} // namespace bakjob
