/* Bundles: small string key-value sets passed between platform services. */
#ifndef BUNDLE_H
#define BUNDLE_H

#ifdef __cplusplus
extern "C" {
#endif

#define BUNDLE_API __attribute__((visibility("default")))

typedef struct _bundle_t bundle;

enum {
	BUNDLE_ERROR_NONE = 0,
	BUNDLE_ERROR_OUT_OF_MEMORY = -12,
	BUNDLE_ERROR_INVALID_PARAMETER = -22,
	BUNDLE_ERROR_KEY_EXISTS = -17,
	BUNDLE_ERROR_KEY_NOT_AVAILABLE = -126
};

BUNDLE_API bundle *bundle_create(void);
BUNDLE_API int bundle_free(bundle *b);
/* Adds a string; an existing key is refused (BUNDLE_ERROR_KEY_EXISTS). */
BUNDLE_API int bundle_add(bundle *b, const char *key, const char *val);
BUNDLE_API int bundle_add_str(bundle *b, const char *key, const char *str);
/* The value of `key`, owned by the bundle, or NULL. */
BUNDLE_API const char *bundle_get_val(bundle *b, const char *key);
/* Points *str at the value of `key`, owned by the bundle (not to be freed);
 * BUNDLE_ERROR_KEY_NOT_AVAILABLE when there is none. */
BUNDLE_API int bundle_get_str(bundle *b, const char *key, char **str);
BUNDLE_API int bundle_get_count(bundle *b);
typedef void (*bundle_iterate_cb_t)(const char *key, const char *val, void *data);
/* Visits the pairs in the order they were added. */
BUNDLE_API void bundle_iterate(bundle *b, bundle_iterate_cb_t callback, void *data);

#ifdef __cplusplus
}
#endif

#endif
