#include "cli/source_folders.h"

#include "common/debug_log.h"
#include "common/handles.h"
#include "common/job_files.h"
#include "common/private_file.h"
#include "common/run_options.h"
#include "common/text.h"
#include "config/current_job.h"
#include "platform/device.h"

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <optional>
#include <sys/stat.h>
#include <unistd.h>

namespace bakjob
{

namespace
{

const char *pointer_at(const char *block, std::size_t offset)
{
    const char *pointer = nullptr;
    std::memcpy(&pointer, block + offset, sizeof pointer);
    return pointer;
}

class ShareTable
{
public:
    ShareTable() { get_samba_info(); }
    ShareTable(const ShareTable &) = delete;
    ShareTable &operator=(const ShareTable &) = delete;
    ~ShareTable() { Free_All_List(); }

    // The first share that holds the folder, or null.
    [[nodiscard]] const char *holding(const std::string &folder) const
    {
        const char *share = pss == nullptr ? nullptr : pointer_at(pss, SHARE_TABLE_FIRST);
        while (share != nullptr) {
            const std::string path = share + SHARE_PATH;
            if (folder == path || folder.starts_with(path + '/')) break;
            share = pointer_at(share, SHARE_NEXT);
        }
        return share;
    }
};

// What looks like a folder below a share may then lie anywhere.
bool leaves_share(const std::string &folder)
{
    return (folder + '/').find("/../") != std::string::npos;
}

// The folder's place below its share; for a file, that of the folder that holds it.
std::string place_below(const std::string &share, const std::string &folder)
{
    std::string place = folder.substr(share.size());
    if (!place.empty() && !is_directory(folder)) place.resize(place.rfind('/'));
    return place.empty() ? "/" : place;
}

bool fill_buffers(const std::string &remote_backup_root, const char *share, const std::string &folder)
{
    return copy_text(share_remote_dir, remote_backup_root + '/' + (share + SHARE_NAME)) &&
           copy_text(share_path, share + SHARE_PATH) &&
           copy_text(share_subdir, place_below(share + SHARE_PATH, folder));
}

struct SerialFile {
    std::optional<std::string> text; // the first line as it was read
    std::string refusal;             // why a file that is there has none
};

// Its folder is open to all, and its text leads root's writes on the remote side to their place.
SerialFile read_serial_file()
{
    struct stat status = {};
    if (lstat(SERIAL_FILE, &status) != 0) {
        return {std::nullopt,
                errno == ENOENT ? "" : std::string("it cannot be read: ") + std::strerror(errno)};
    }
    UniqueFd opened = open_own_file(SERIAL_FILE, O_RDONLY);
    const bool others_write =
        opened && (fstat(opened.get(), &status) != 0 || (status.st_mode & (S_IWGRP | S_IWOTH)) != 0);
    const UniqueFile file(opened && !others_write ? fdopen(opened.get(), "r") : nullptr);
    if (!file) return {std::nullopt, "it is not a plain file that root alone may write"};
    opened.release();
    std::array<char, SERIAL_SIZE> line{};
    if (std::fgets(line.data(), line.size(), file.get()) == nullptr) line[0] = '\0';
    const std::string text = line.data();
    const bool leads_elsewhere = contains(text, "/") || text == "." || text == "..";
    if (leads_elsewhere) return {std::nullopt, "its text is no name for a folder"};
    return {text, ""};
}

} // namespace

void rsync_split_folders(RsyncJob &job, FolderTable &table)
{
    const bool cut = was_cut(job, "local_path");
    if (cut) {
        char *const last = std::strrchr(job.local_path, ':');
        (last == nullptr ? job.local_path[0] : *last) = '\0';
    }
    rsync_split_list(job.local_path, ":", table);
    if (cut) ++table.left_out;
}

Refusal enter_share(const std::string &remote_backup_root, const std::string &folder)
{
    share_remote_dir[0] = share_path[0] = share_subdir[0] = '\0';
    const ShareTable shares;
    if (leaves_share(folder)) return refused("local_path", '[' + folder + "] has a \"..\" step");
    const char *const share = shares.holding(folder);
    if (share == nullptr) return refused("local_path", "no share holds [" + folder + ']');
    if (!fill_buffers(remote_backup_root, share, folder)) {
        return refused("local_path", '[' + folder + "] is too long");
    }
    if (chdir(share_path) == 0) return {};
    return trace_refusal(std::string("share [") + share_path +
                         "] cannot be entered: " + std::strerror(errno));
}

int rsync_resolve_folder(const std::string &remote_backup_root, const std::string &folder)
{
    return enter_share(remote_backup_root, folder) ? -1 : 0;
}

Checked rsync_remote_root(const JobName &job)
{
    const SerialFile file = read_serial_file();
    if (!file.refusal.empty()) {
        return refused(std::string("serial text of [") + SERIAL_FILE + ']', file.refusal);
    }
    const std::string serial = file.text.value_or("");
    if (serial.find_first_of("\r\n") != std::string::npos) {
        DebugLog("ERROR: line break in the serial text of [%s]: no remote folder can be named\n",
                 SERIAL_FILE);
    }
    return format_text("/%s_remote_backup/%s", serial.c_str(), job.c_str());
}

Refusal set_ends(RsyncJob &job, const std::string &folder)
{
    std::string remote_path = std::string(job.remote_path) + share_remote_dir;
    if (!is_restore_run()) remote_path += folder.substr(std::strlen(share_path));
    if (!copy_text(job.local_path, is_restore_run() ? share_path : folder)) {
        return refused("local_path", "too long");
    }
    return copy_text(job.remote_path, remote_path) ? Refusal() : refused("remote_path", "too long");
}

void rsync_write_progress(const JobName &job, const std::string &folder, int index, int count)
{
    if (folder.empty()) return;
    replace_file(progress_file(job), 0644, format_text("%s\n%d/%d\n", folder.c_str(), index, count));
}

void rsync_remove_progress(const JobName &job)
{
    std::remove(progress_file(job).c_str());
}

int rsync_read_serial(char (&serial)[SERIAL_SIZE])
{
    const SerialFile file = read_serial_file();
    if (!file.text) return -1;
    copy_text(serial, *file.text);
    return 0;
}

std::string rsync_serial_refusal()
{
    return read_serial_file().refusal;
}

} // namespace bakjob
