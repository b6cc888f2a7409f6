#pragma once

#include <string>
#include <vector>

// Becomes the stock rsync with these arguments, its name first. Comes back only when that fails, with the
// exit status.
int exec_stock_rsync(const std::vector<std::string> &arguments);
