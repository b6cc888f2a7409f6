#pragma once

// Free space and folder sizes, here and on the remote host, as text for people. Remote ones go by ssh with
// the job's login. What cannot be measured is "N/A", and so is what du prints in terabytes.

#include "config/job.h"
#include "config/remote_modules.h"

#include <string>
#include <string_view>

namespace bakjob
{

// Free space of a volume ("HD_a2") on this device.
void rsync_local_free_space(const std::string &volume, SizeText &free);

// Free space of the four volumes on the remote host. Without a host the texts stay as they are.
void measure_remote_free_space(const RsyncJob &job, SizeText (&free)[VOLUMES]);

// 1 when the first line that the command prints is "/usr/bin/du", else 0.
int rsync_remote_has_du(const std::string &command);

// Size of a folder on the remote host. A path that the shell there would act on is never sent: "N/A". Without
// a host the text stays as it is; after an empty reply the text that stood there is judged.
void measure_remote_folder(const RsyncJob &job, const std::string &folder, SizeText &size);

// The same with CurrentJob.
void rsync_remote_free_space(SizeText (&free)[VOLUMES]);
void rsync_remote_du(const std::string &folder, SizeText &size);

// Total size of local folders, separated by ":"; the list is cut in place. "N/A" when one of them cannot be
// asked for.
void rsync_local_du(char *folders, SizeText &size);

// The fourth word of a line of "df -h"; "N/A" when there is none or it does not fit.
void size_of_df_line(std::string_view line, SizeText &size);

// The first word of a reply of du, or the earlier text when the reply is empty; "N/A" when that is no size.
void size_of_du_reply(std::string_view line, SizeText &size);

} // namespace bakjob
