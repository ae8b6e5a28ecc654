/* Linked into every program of the build: sanitizer settings travel with
 * the binaries, so a program run by hand behaves as under CTest. EFL itself
 * keeps some allocations for the life of the process, none ours to fix:
 * Evas leaks a 16-byte record for every smart object it constructs, Eina
 * keeps the records of the engine modules it loaded, a window rotation
 * leaks its widget iterator, and efreet (the desktop-file service) at times
 * posts an event while elm_shutdown is already past the point where events
 * are freed, a 48-byte record that lives until exit. Leaks of the editor's
 * own records and buffers have no such frame and are still reported. */
extern "C" __attribute__((visibility("default"), used)) const char *__asan_default_options()
{
	return "detect_leaks=1:fast_unwind_on_malloc=0";
}

extern "C" __attribute__((visibility("default"), used)) const char *__lsan_default_suppressions()
{
	return "leak:libevas.so.1\n"
	       "leak:eina_module_new\n"
	       "leak:efl_ui_win_rotation_set\n"
	       "leak:libefreet.so.1\n";
}
