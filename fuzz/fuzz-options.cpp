/* Sanitizer settings built into every fuzz target. The runtime is shared
 * (see IE_FUZZ), and libFuzzer's C++ library is loaded before it: harmless,
 * as that library does not replace malloc. */
extern "C" __attribute__((visibility("default"), used)) const char *__asan_default_options()
{
	return "verify_asan_link_order=0:detect_leaks=1";
}
