/* One headless Elementary window for the benchmarks that drive EFL: the
 * buffer engine with synchronous rendering, EFL's home in a scratch folder. */
#ifndef BENCH_EFL_H
#define BENCH_EFL_H

#include <Elementary.h>

#include <cstdlib>
#include <filesystem>
#include <string>

namespace bench {

/* Made on first use with the size of that first call; later calls return
 * the same window. */
inline Evas_Object *efl_window(int width, int height)
{
	static Evas_Object *win = [width, height] {
		const std::string home = std::filesystem::temp_directory_path() / "ie-bench-efl-home";
		for (const char *sub : {"cache", "config", "runtime"})
			std::filesystem::create_directories(home + "/" + sub);
		std::filesystem::permissions(home + "/runtime", std::filesystem::perms::owner_all);
		setenv("HOME", home.c_str(), 0);
		setenv("XDG_CACHE_HOME", (home + "/cache").c_str(), 0);
		setenv("XDG_CONFIG_HOME", (home + "/config").c_str(), 0);
		setenv("XDG_RUNTIME_DIR", (home + "/runtime").c_str(), 0);
		setenv("ELM_ENGINE", "buffer", 1);
		setenv("ECORE_NO_SYSTEM_MODULES", "1", 0);
		setenv("ECORE_EVAS_FORCE_SYNC_RENDER", "1", 1);
		setenv("ECORE_EVAS_RENDER_NOSYNC", "1", 1);
		setenv("EINA_LOG_BACKTRACE", "-1", 0);
		setenv("EINA_LOG_LEVELS", "ecore_con:0", 0);
		setenv("ELM_PROFILE_NOSAVE", "1", 0);
		setenv("PLATFORM_LOG_LEVEL", "S", 0);
		elm_init(0, nullptr);
		Evas_Object *w = elm_win_add(nullptr, "ie-bench", ELM_WIN_BASIC);
		evas_object_resize(w, width, height);
		evas_object_show(w);
		return w;
	}();
	return win;
}

} // namespace bench

#endif
