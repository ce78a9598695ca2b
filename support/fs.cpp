#include "support/fs.h"

#include <cerrno>
#include <err.h>
#include <unistd.h>

namespace velm_fs {

void
remove(const std::string& path)
{
    if (unlink(path.c_str()) == 0 || errno == ENOENT)
        return;
    warn("remove: could not remove %s", path.c_str());
    throw errno;
}

bool
path_exists(const std::string& path)
{
    return access(path.c_str(), F_OK) == 0;
}

std::string
read_symlink(const std::string& path)
{
    char buffer[1025];
    ssize_t n = readlink(path.c_str(), buffer, 1024);
    if (n >= 0) {
        buffer[n] = '\0';
        return std::string(buffer, static_cast<size_t>(n));
    }
    if (errno == ENOENT)
        return std::string();
    warn("read_symlink: %s", path.c_str());
    throw errno;
}

void
create_symlink(const std::string& target, const std::string& link_path)
{
    if (symlink(target.c_str(), link_path.c_str()) == 0)
        return;
    warn("create_symlink: from %s to %s", link_path.c_str(), target.c_str());
    throw errno;
}

} // namespace velm_fs
