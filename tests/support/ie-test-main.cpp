/* main() of the test binaries: a headless EFL environment (buffer engine,
 * synchronous rendering, a private home), Elementary initialised once, and
 * every EFL error line recorded for the fixture to judge. */
#include <Elementary.h>
#include <gtest/gtest.h>

#include <clocale>
#include <cstdlib>
#include <filesystem>
#include <mutex>
#include <unistd.h>

#include "ie-config.h"
#include "ie-test-internal.h"

namespace iet {

namespace {

std::mutex errors_lock;
std::vector<std::string> errors;
std::vector<std::string> allowed;

void record_eina_log(const Eina_Log_Domain *d, Eina_Log_Level level, const char *file, const char *fnc,
		     int line, const char *fmt, void *data, va_list args)
{
	if (level <= EINA_LOG_LEVEL_ERR) {
		va_list copy;
		va_copy(copy, args);
		char text[1024];
		vsnprintf(text, sizeof(text), fmt, copy);
		va_end(copy);
		std::lock_guard<std::mutex> hold(errors_lock);
		errors.push_back(std::string(d && d->name ? d->name : "?") + ": " + fnc + ": " + text);
	}
	eina_log_print_cb_stderr(d, level, file, fnc, line, fmt, data, args);
}

std::string data_dir;

/* EFL's home (efreet's cache, Elementary's config) is shared by the test
 * processes of a build when IE_TEST_HOME names it, so that efreet builds its
 * cache once. The runtime directory holds efreetd's socket, whose path the
 * daemon cannot take beyond about 90 characters (it aborts, and every EFL
 * process then waits 10 seconds for it): it is the short private directory
 * the `ie` script made for the run (IE_TEST_RUNTIME_DIR), or one of this
 * process's own under the system's temporary folder, wherever the build tree
 * lies. Each process keeps its own data directory for the platform
 * services. */
void prepare_environment()
{
	std::string scratch = (std::filesystem::temp_directory_path() / "ie-test-XXXXXX").string();
	if (mkdtemp(scratch.data()))
		data_dir = scratch;
	const char *shared_home = getenv("IE_TEST_HOME");
	std::string home = shared_home ? shared_home : data_dir + "/home";
	for (const char *sub : {"cache", "config"})
		std::filesystem::create_directories(home + "/" + sub);
	const char *run_runtime = getenv("IE_TEST_RUNTIME_DIR");
	std::string runtime = run_runtime && *run_runtime ? run_runtime : data_dir + "/runtime";
	std::filesystem::create_directories(runtime);
	std::filesystem::permissions(runtime, std::filesystem::perms::owner_all);
	setenv("HOME", home.c_str(), 1);
	setenv("XDG_CACHE_HOME", (home + "/cache").c_str(), 1);
	setenv("XDG_CONFIG_HOME", (home + "/config").c_str(), 1);
	setenv("XDG_RUNTIME_DIR", runtime.c_str(), 1);
	setenv("ELM_ENGINE", "buffer", 1);
	setenv("ECORE_NO_SYSTEM_MODULES", "1", 1);
	setenv("ECORE_EVAS_FORCE_SYNC_RENDER", "1", 1);
	setenv("ECORE_EVAS_RENDER_NOSYNC", "1", 1);
	setenv("EINA_LOG_BACKTRACE", "-1", 1);
	setenv("EINA_LOG_LEVELS", "ecore_con:0", 1);
	setenv("ELM_PROFILE_NOSAVE", "1", 1);
	setenv("PLATFORM_LOG_LEVEL", "S", 0);
	// gettext ignores catalogues in the C locale: run as an English user.
	setenv("LANG", "C.UTF-8", 1);
	setenv("LANGUAGE", "en", 1);
	setenv("MEDIA_DB_PATH", (data_dir + "/media.db").c_str(), 0);
	setenv("VANTRIC_LOG_DB", (data_dir + "/vantric-log.db").c_str(), 0);
	setenv("STORAGE_INTERNAL_ROOT", data_dir.c_str(), 0);
	setenv("APP_LAUNCH_DIR", (data_dir + "/launchers").c_str(), 0);
}

class ElementaryEnvironment : public ::testing::Environment {
public:
	ElementaryEnvironment(int argc, char **argv) : argc_(argc), argv_(argv) {}
	void SetUp() override
	{
		elm_init(argc_, argv_);
		const char *theme = RES_DIR "edje/image-editor.edj";
		if (access(theme, R_OK) == 0)
			elm_theme_extension_add(nullptr, theme);
	}
	void TearDown() override
	{
		elm_shutdown();
		if (!data_dir.empty())
			std::filesystem::remove_all(data_dir);
	}

private:
	int argc_;
	char **argv_;
};

} // namespace

std::vector<std::string> &efl_errors()
{
	return errors;
}

std::vector<std::string> &allowed_efl_errors()
{
	return allowed;
}

void efl_errors_clear()
{
	std::lock_guard<std::mutex> hold(errors_lock);
	errors.clear();
}

} // namespace iet

int main(int argc, char **argv)
{
	iet::prepare_environment();
	setlocale(LC_ALL, "");
	eina_init();
	eina_log_print_cb_set(iet::record_eina_log, nullptr);
	::testing::InitGoogleTest(&argc, argv);
	::testing::AddGlobalTestEnvironment(new iet::ElementaryEnvironment(argc, argv));
	int result = RUN_ALL_TESTS();
	eina_shutdown();
	return result;
}
