#pragma once

// Every name that the module gives to a file, built and recognised here alone. Paths are not escaped for the
// shell.

#include "common/job_name.h"

#include <cstdint>
#include <string>
#include <string_view>

namespace bakjob
{

inline constexpr const char *CONFIG_FILE = "/etc/NAS_CFG/config.xml";
inline constexpr const char *CONFIG_LOCK_FILE = "/tmp/rsync_write_conf.lock";
// Locked by whoever replaces what stands at a lock's name (config/config_lock.h).
inline constexpr const char *LOCK_GUARD_FILE = "/var/run/bakjob_lock.guard";
// Volumes are mounted below it, under names of five characters: "HD_a2" and so on.
inline constexpr std::string_view VOLUMES_FOLDER = "/mnt/HD/";
inline constexpr std::size_t VOLUME_LENGTH = 5;
inline constexpr const char *SERIAL_FILE = "/tmp/kv_serial.txt";
inline constexpr const char *TRACE_FILE = "/tmp/rsync_debug";

std::string pid_file(const JobName &job);
std::string password_file(const JobName &job);
std::string progress_file(const JobName &job);

// A job's state that could not be written into the configuration (config/unrecorded_state.h).
std::string unrecorded_file(const JobName &job);

// Written by the appliance's rsync: how far a transfer is, and what it has moved when it has ended.
std::string transfer_file(const JobName &job);
std::string transfer_size_file(const JobName &job);

// Local copy of the remote daemon's configuration.
std::string remote_config_copy(const JobName &job);
inline constexpr const char *DISCOVERY_CONFIG_COPY = "/tmp/remote_rinfo.txt";
inline constexpr const char *DISCOVERY_LOCK_FILE = "/tmp/remote_rinfo.lock";

// Snapshots that a job keeps. A recover run names one of so many.
inline constexpr int MIN_SNAPSHOTS = 3;
inline constexpr int MAX_SNAPSHOTS = 10;

// Name of a snapshot folder inside the job's local folder: the job's name (or "backup") and the number, 0 the
// newest, with a full stop between them.
std::string snapshot_name(std::string_view job_name, std::int64_t number);
std::string snapshot_path(std::string_view folder, std::string_view job_name, std::int64_t number);

// Whether a folder entry is a snapshot of the job by its name alone: anything may follow the full stop.
bool is_snapshot_name(std::string_view job_name, std::string_view entry);

} // namespace bakjob
