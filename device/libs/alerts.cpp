#include "common/handles.h"
#include "common/text.h"
#include "platform/device.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <string>
#include <sys/syslog.h>
#include <unistd.h>

namespace
{

constexpr const char *ALERT_FILE = "/var/log/device_alerts";

// One write, so that lines of processes that raise alerts at the same time do not mix.
bool append(const std::string &line)
{
    const int flags = O_WRONLY | O_APPEND | O_CREAT | O_NOFOLLOW | O_CLOEXEC;
    const bakjob::UniqueFd fd(open(ALERT_FILE, flags, 0640));
    return fd && write(fd.get(), line.data(), line.size()) == static_cast<ssize_t>(line.size());
}

} // namespace

int fireAlert(int level, int code, const char *text)
{
    if (!text) return -1;
    std::string alert = std::to_string(level) + ' ' + std::to_string(code) + ' ' + text;
    std::replace_if(alert.begin(), alert.end(), bakjob::is_control, '?');
    syslog(LOG_WARNING, "%s", alert.c_str());
    if (append(alert + '\n')) return 0;
    std::fprintf(stderr, "alerts: cannot write %s: %s\n", ALERT_FILE, std::strerror(errno));
    return -1;
}
