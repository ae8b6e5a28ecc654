/* Bundles: small string key-value sets passed between platform services. */
#ifndef KV_BUNDLE_H
#define KV_BUNDLE_H

#include <platform_error.h>

#ifdef __cplusplus
extern "C" {
#endif

#define KV_BUNDLE_API __attribute__((visibility("default")))

typedef struct Kv_Bundle Kv_Bundle;

enum {
	KV_BUNDLE_ERROR_NONE = PLATFORM_ERROR_NONE,
	KV_BUNDLE_ERROR_OUT_OF_MEMORY = PLATFORM_ERROR_OUT_OF_MEMORY,
	KV_BUNDLE_ERROR_INVALID_PARAMETER = PLATFORM_ERROR_INVALID_PARAMETER,
	KV_BUNDLE_ERROR_KEY_NOT_AVAILABLE = PLATFORM_ERROR_KEY_NOT_FOUND,
	KV_BUNDLE_ERROR_KEY_EXISTS = PLATFORM_ERROR_BLOCK(2) - 1
};

KV_BUNDLE_API Kv_Bundle *bundle_create(void);
KV_BUNDLE_API int bundle_free(Kv_Bundle *b);
/* Adds a string; an existing key is refused (KV_BUNDLE_ERROR_KEY_EXISTS). */
KV_BUNDLE_API int bundle_add(Kv_Bundle *b, const char *key, const char *val);
KV_BUNDLE_API int bundle_add_string(Kv_Bundle *b, const char *key, const char *str);
/* The value of `key`, owned by the bundle, or NULL. */
KV_BUNDLE_API const char *bundle_lookup(Kv_Bundle *b, const char *key);
/* Points *str at the value of `key`, owned by the bundle (not to be freed);
 * KV_BUNDLE_ERROR_KEY_NOT_AVAILABLE when there is none. */
KV_BUNDLE_API int bundle_lookup_string(Kv_Bundle *b, const char *key, char **str);
KV_BUNDLE_API int bundle_size(Kv_Bundle *b);
typedef void (*Kv_Bundle_Visit_Cb)(const char *key, const char *val, void *data);
/* Visits the pairs in the order they were added. */
KV_BUNDLE_API void bundle_foreach(Kv_Bundle *b, Kv_Bundle_Visit_Cb callback, void *data);

#ifdef __cplusplus
}
#endif

#endif
