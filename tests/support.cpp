#include "support.h"

#include "common/run_options.h"
#include "common/text.h"
#include "config/job_list.h"
#include "platform/config_store.h"

#include <array>
#include <chrono>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <system_error>
#include <thread>
#include <unistd.h>

namespace fs = std::filesystem;

std::string read_file(const std::string &path)
{
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf();
    return text.str();
}

void write_file(const std::string &path, const std::string &text)
{
    fs::create_directories(fs::path(path).parent_path());
    std::ofstream(path, std::ios::binary) << text;
}

bool exists(const std::string &path)
{
    return fs::exists(fs::symlink_status(path));
}

std::string octal_mode(const std::string &path)
{
    struct stat status = {};
    if (lstat(path.c_str(), &status) != 0) return "none";
    std::array<char, 8> mode{};
    snprintf(mode.data(), mode.size(), "%o", status.st_mode & 07777U);
    return mode.data();
}

Ran shell(const std::string &command)
{
    std::string output;
    FILE *const pipe = popen(command.c_str(), "r"); // NOLINT(cert-env33-c)
    std::array<char, 4096> buffer{};
    for (std::size_t n = 0; (n = fread(buffer.data(), 1, buffer.size(), pipe)) > 0;)
        output.append(buffer.data(), n);
    const int status = pclose(pipe);
    return {WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status), output};
}

pid_t start(const std::vector<std::string> &arguments)
{
    const pid_t child = fork();
    if (child != 0) return child;
    const int output = open("/tmp/output", O_WRONLY | O_CREAT | O_TRUNC, 0600);
    dup2(output, STDOUT_FILENO);
    dup2(output, STDERR_FILENO);
    std::vector<char *> argv{const_cast<char *>("bakjob")};
    for (const std::string &argument : arguments)
        argv.push_back(const_cast<char *>(argument.c_str()));
    argv.push_back(nullptr);
    execv("/usr/sbin/bakjob", argv.data());
    _exit(127);
}

int wait_for(pid_t child)
{
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

int in_child(const std::function<int()> &body)
{
    const pid_t child = fork();
    if (child == 0) _exit(body());
    return wait_for(child);
}

void become_neighbour()
{
    if (setgid(65534) != 0 || setuid(65534) != 0) _exit(1);
}

std::string printed_by(const std::function<void()> &body)
{
    testing::internal::CaptureStdout();
    body();
    return testing::internal::GetCapturedStdout();
}

std::string complaints_of(const std::function<void()> &body)
{
    testing::internal::CaptureStderr();
    body();
    return testing::internal::GetCapturedStderr();
}

testing::AssertionResult has(const std::string &text, const std::string &part)
{
    if (text.find(part) != std::string::npos) return testing::AssertionSuccess();
    return testing::AssertionFailure() << "not in it: " << part << "\n" << text;
}

bool eventually(const std::function<bool()> &condition, int seconds)
{
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(seconds);
    while (!condition()) {
        if (std::chrono::steady_clock::now() > end) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    return true;
}

bool has_open(pid_t process, const std::string &path)
{
    std::error_code none;
    for (const auto &handle : fs::directory_iterator("/proc/" + std::to_string(process) + "/fd", none))
        if (fs::equivalent(handle.path(), path, none)) return true;
    return false;
}

void Appliance::SetUp()
{
    // Not across mounts: a checkout may lie in /tmp.
    const std::string folders =
        "/etc/NAS_CFG /tmp /mnt/HD /var/lib/device_flash /remote/backup /remote/data /remote/archive";
    shell("cd / && mkdir -p " + folders + " && find " + folders +
          " -xdev -mindepth 1 -delete 2>/dev/null; "
          "rm -rf /run/bakjob_*");
    fs::remove("/var/log/device_alerts");
    fs::remove(CRON);
    bakjob::run_options = {};
}

void ApplianceWithShare::SetUp()
{
    Appliance::SetUp();
    add_share("Public", SHARE);
    write_file(SHARE + "/file", "x");
    write_file("/tmp/kv_serial.txt", "S1");
    shell("rm -f ~root/.ssh/known_hosts");
}

void Appliance::TearDown()
{
    bakjob::rsync_free_jobs();
    fs::current_path("/");
}

// The store looks at its file before it reads a plain path, and takes changes only of lists that were read
// since.
static void look_at_store(const std::string &path)
{
    const std::string plain = path.substr(0, path.find(':'));
    xml_get_int((plain.substr(0, plain.rfind('/')) + "/count").c_str());
}

void store_set(const std::string &path, const std::string &text)
{
    look_at_store(path);
    ASSERT_EQ(xml_set_str(path.c_str(), text.c_str()), 0) << path;
}

std::string store_get(const std::string &path)
{
    look_at_store(path);
    std::array<char, 4096> text{};
    return xml_get_str(path.c_str(), text.size(), text.data()) < 0 ? "(none)" : text.data();
}

void store_save()
{
    ASSERT_EQ(xml_write_file(STORE.c_str()), 0);
}

Keys keys_of(const std::string &words)
{
    Keys keys;
    std::istringstream stream(words);
    for (std::string word; stream >> word;)
        keys[word.substr(0, word.find('='))] = word.substr(word.find('=') + 1);
    return keys;
}

int add_job(const Keys &keys)
{
    Keys all = keys_of("enable=1 state=0 rstate=0 pwd_encoded=0 server_type=2 backup_type=1 rsync_mode=2 "
                       "schedule_mode=1 use_ssh=0 keep_exist_file=0 inc_enable=0 inc_number=3 retry=0 "
                       "retry_interval=1 rsync_timeout=30 job_name=daily rsync_user=bk rsync_pwd=secret "
                       "ssh_user=root ssh_pwd= port=873 remote_ip=127.0.0.1 remote_path=backup local_path=" +
                       SHARE);
    for (const auto &[key, value] : keys)
        all[key] = value;
    const int item = std::max(0, xml_get_int("/backup_mgr/rsync/count")) + 1;
    store_set("/backup_mgr/rsync/count", std::to_string(item));
    for (const auto &[key, value] : all)
        store_set("/backup_mgr/rsync/item:" + std::to_string(item) + "/" + key, value);
    store_save();
    return item;
}

std::string job_key(int item, const std::string &key)
{
    return store_get("/backup_mgr/rsync/item:" + std::to_string(item) + "/" + key);
}

void add_share(const std::string &name, const std::string &path)
{
    const int item = std::max(0, xml_get_int("/system_mgr/samba/share/count")) + 1;
    store_set("/system_mgr/samba/share/count", std::to_string(item));
    store_set("/system_mgr/samba/share/item:" + std::to_string(item) + "/name", name);
    store_set("/system_mgr/samba/share/item:" + std::to_string(item) + "/path", path);
    store_save();
    fs::create_directories(path);
}

void set_schedule(const std::vector<std::string> &commands)
{
    const std::string entries = "/system_mgr/crond/rsync/";
    const int groups = std::max(0, xml_get_int("/system_mgr/crond/list/count")) + 1;
    store_set("/system_mgr/crond/list/count", std::to_string(groups));
    store_set("/system_mgr/crond/list/name:" + std::to_string(groups), "rsync");
    store_set(entries + "count", std::to_string(commands.size()));
    for (std::size_t i = 0; i < commands.size(); ++i)
        store_set(entries + "item:" + std::to_string(i + 1) + "/run", commands[i]);
    store_save();
}

bakjob::JobName named(const std::string &name)
{
    return bakjob::JobName::checked(name).value();
}

bakjob::RsyncJob make_job(const std::string &name)
{
    bakjob::RsyncJob job{};
    job.enable = job.pwd_encoded = job.backup_type = 1;
    job.server_type = job.rsync_mode = 2;
    job.rsync_timeout = 600;
    EXPECT_TRUE(bakjob::copy_text(job.job_name, name) && bakjob::copy_text(job.rsync_user, "bk") &&
                bakjob::copy_text(job.rsync_pwd, "c2VjcmV0") && bakjob::copy_text(job.port, "873") &&
                bakjob::copy_text(job.remote_ip, "192.168.1.20") &&
                bakjob::copy_text(job.remote_path, "backup/share1") &&
                bakjob::copy_text(job.local_path, "/srv/share1") &&
                bakjob::copy_text(job.rsync_pwd_file, "/tmp/r_" + name + ".passwd"));
    return job;
}

Fake::Fake(std::string program, const std::string &script) : program_(std::move(program))
{
    if (exists(program_)) fs::rename(program_, program_ + ".real");
    write_file(program_, "#!/bin/sh\n" + script);
    fs::permissions(program_, fs::perms(0755));
}

Fake::~Fake()
{
    fs::remove(program_);
    if (exists(program_ + ".real")) fs::rename(program_ + ".real", program_);
}

ReadOnly::ReadOnly(std::string folder) : folder_(std::move(folder))
{
    EXPECT_EQ(mount(folder_.c_str(), folder_.c_str(), "", MS_BIND, nullptr), 0) << folder_;
    EXPECT_EQ(mount(nullptr, folder_.c_str(), "", MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
}

ReadOnly::~ReadOnly()
{
    umount2(folder_.c_str(), MNT_DETACH);
}

std::vector<std::string> alerts()
{
    return lines_of(read_file("/var/log/device_alerts"));
}

Ran bakjob_program(const std::string &arguments)
{
    return shell("/usr/sbin/bakjob " + arguments + " 2>&1");
}

std::vector<std::string> lines_of(const std::string &text)
{
    std::vector<std::string> lines;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);)
        lines.push_back(line);
    return lines;
}
