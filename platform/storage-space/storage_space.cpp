#include "storage_space.h"

#include <cerrno>
#include <cstdlib>

namespace {

constexpr char default_internal_root[] = "/home";

} // namespace

extern "C" const char *storage_get_internal_root(void)
{
	const char *root = getenv("STORAGE_INTERNAL_ROOT");
	return (root && *root) ? root : default_internal_root;
}

extern "C" int storage_get_internal_memory_size(struct statvfs *buf)
{
	if (!buf)
		return STORAGE_SPACE_ERROR_INVALID_PARAMETER;
	if (statvfs(storage_get_internal_root(), buf) != 0)
		return errno == ENOMEM ? STORAGE_SPACE_ERROR_OUT_OF_MEMORY : STORAGE_SPACE_ERROR_OPERATION_FAILED;
	return STORAGE_SPACE_ERROR_NONE;
}
