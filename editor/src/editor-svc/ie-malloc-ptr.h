#ifndef IE_MALLOC_PTR_H
#define IE_MALLOC_PTR_H

#include <cstdlib>
#include <memory>

/* Owns memory from malloc (ours, or handed over by C libraries and the
 * engine), so every early return frees it. */
struct Ie_Free_Deleter {
	void operator()(void *ptr) const { free(ptr); }
};

template <class T>
using Ie_Malloc_Ptr = std::unique_ptr<T, Ie_Free_Deleter>;

#endif
