#include "bundle.h"

#include <algorithm>
#include <new>
#include <string>
#include <utility>
#include <vector>

// Pairs stay in insertion order, which bundle_iterate promises; bundles
// hold a handful of keys, so a linear search is the right size.
struct _bundle_t {
	std::vector<std::pair<std::string, std::string>> pairs;

	const std::string *find(const char *key) const
	{
		auto it = std::find_if(pairs.begin(), pairs.end(),
				       [key](const auto &pair) { return pair.first == key; });
		return it == pairs.end() ? nullptr : &it->second;
	}
};

extern "C" bundle *bundle_create(void)
{
	return new (std::nothrow) bundle();
}

extern "C" int bundle_free(bundle *b)
{
	if (!b)
		return BUNDLE_ERROR_INVALID_PARAMETER;
	delete b;
	return BUNDLE_ERROR_NONE;
}

extern "C" int bundle_add_str(bundle *b, const char *key, const char *str)
{
	if (!b || !key || !*key || !str)
		return BUNDLE_ERROR_INVALID_PARAMETER;
	if (b->find(key))
		return BUNDLE_ERROR_KEY_EXISTS;
	try {
		b->pairs.emplace_back(key, str);
	} catch (const std::bad_alloc &) {
		return BUNDLE_ERROR_OUT_OF_MEMORY;
	}
	return BUNDLE_ERROR_NONE;
}

extern "C" int bundle_add(bundle *b, const char *key, const char *val)
{
	return bundle_add_str(b, key, val);
}

extern "C" const char *bundle_get_val(bundle *b, const char *key)
{
	if (!b || !key)
		return nullptr;
	const std::string *value = b->find(key);
	return value ? value->c_str() : nullptr;
}

extern "C" int bundle_get_str(bundle *b, const char *key, char **str)
{
	if (!b || !key || !str)
		return BUNDLE_ERROR_INVALID_PARAMETER;
	const char *value = bundle_get_val(b, key);
	if (!value)
		return BUNDLE_ERROR_KEY_NOT_AVAILABLE;
	// The string stays owned by the bundle, as with bundle_get_val.
	*str = const_cast<char *>(value);
	return BUNDLE_ERROR_NONE;
}

extern "C" int bundle_get_count(bundle *b)
{
	return b ? static_cast<int>(b->pairs.size()) : 0;
}

extern "C" void bundle_iterate(bundle *b, bundle_iterate_cb_t callback, void *data)
{
	if (!b || !callback)
		return;
	for (const auto &pair : b->pairs)
		callback(pair.first.c_str(), pair.second.c_str(), data);
}
