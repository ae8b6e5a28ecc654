#include "kv_bundle.h"

#include <algorithm>
#include <new>
#include <string>
#include <utility>
#include <vector>

// Pairs stay in insertion order, which bundle_foreach promises; bundles
// hold a handful of keys, so a linear search is the right size.
struct Kv_Bundle {
	std::vector<std::pair<std::string, std::string>> pairs;

	const std::string *find(const char *key) const
	{
		auto it = std::find_if(pairs.begin(), pairs.end(),
				       [key](const auto &pair) { return pair.first == key; });
		return it == pairs.end() ? nullptr : &it->second;
	}
};

extern "C" Kv_Bundle *bundle_create(void)
{
	return new (std::nothrow) Kv_Bundle();
}

extern "C" int bundle_free(Kv_Bundle *b)
{
	if (!b)
		return KV_BUNDLE_ERROR_INVALID_PARAMETER;
	delete b;
	return KV_BUNDLE_ERROR_NONE;
}

extern "C" int bundle_add_string(Kv_Bundle *b, const char *key, const char *str)
{
	if (!b || !key || !*key || !str)
		return KV_BUNDLE_ERROR_INVALID_PARAMETER;
	if (b->find(key))
		return KV_BUNDLE_ERROR_KEY_EXISTS;
	try {
		b->pairs.emplace_back(key, str);
	} catch (const std::bad_alloc &) {
		return KV_BUNDLE_ERROR_OUT_OF_MEMORY;
	}
	return KV_BUNDLE_ERROR_NONE;
}

extern "C" int bundle_add(Kv_Bundle *b, const char *key, const char *val)
{
	return bundle_add_string(b, key, val);
}

extern "C" const char *bundle_lookup(Kv_Bundle *b, const char *key)
{
	if (!b || !key)
		return nullptr;
	const std::string *value = b->find(key);
	return value ? value->c_str() : nullptr;
}

extern "C" int bundle_lookup_string(Kv_Bundle *b, const char *key, char **str)
{
	if (!b || !key || !str)
		return KV_BUNDLE_ERROR_INVALID_PARAMETER;
	const char *value = bundle_lookup(b, key);
	if (!value)
		return KV_BUNDLE_ERROR_KEY_NOT_AVAILABLE;
	// The string stays owned by the bundle, as with bundle_lookup.
	*str = const_cast<char *>(value);
	return KV_BUNDLE_ERROR_NONE;
}

extern "C" int bundle_size(Kv_Bundle *b)
{
	return b ? static_cast<int>(b->pairs.size()) : 0;
}

extern "C" void bundle_foreach(Kv_Bundle *b, Kv_Bundle_Visit_Cb callback, void *data)
{
	if (!b || !callback)
		return;
	for (const auto &pair : b->pairs)
		callback(pair.first.c_str(), pair.second.c_str(), data);
}
