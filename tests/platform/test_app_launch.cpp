#include <app_launch.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <sstream>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include "ie-test-harness.h"

namespace {

template <typename Done> void wait_until(Done done)
{
	auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
	while (!done() && std::chrono::steady_clock::now() < deadline)
		std::this_thread::sleep_for(std::chrono::milliseconds(10));
}

// A finished child not yet collected, looked at without collecting it.
bool zombie_child()
{
	siginfo_t info = {};
	return waitid(P_ALL, 0, &info, WEXITED | WNOHANG | WNOWAIT) == 0 && info.si_pid != 0;
}

class AppControl : public iet::EflTest {
protected:
	void SetUp() override
	{
		iet::EflTest::SetUp();
		launchers = iet::temp_dir();
		output = iet::temp_dir() + "/args";
		setenv("APP_LAUNCH_DIR", launchers.c_str(), 1);
		ASSERT_EQ(app_control_create(&handle), APP_LAUNCH_ERROR_NONE);
	}
	void TearDown() override
	{
		app_control_destroy(handle);
		iet::EflTest::TearDown();
	}

	// A launcher that writes its arguments, one per line, to `output`.
	void install_launcher(const std::string &app_id, mode_t mode = 0755)
	{
		std::string path = launchers + "/" + app_id;
		std::ofstream(path) << "#!/bin/sh\nfor a in \"$@\"; do echo \"$a\"; done > " << output << ".tmp\n"
				    << "mv " << output << ".tmp " << output << "\n";
		chmod(path.c_str(), mode);
	}

	int launch(const char *app_id)
	{
		app_control_set_app_id(handle, app_id);
		return app_control_send_launch_request(handle, nullptr, nullptr);
	}

	std::string launchers, output;
	App_Request *handle = nullptr;
};

} // namespace

TEST_F(AppControl, LaunchRunsTheRegisteredLauncherWithTheRequestAndReapsIt)
{
	install_launcher("setting-storage-efl");
	app_control_set_operation(handle, APP_LAUNCH_OPERATION_VIEW);
	app_control_set_window(handle, 4242);
	app_control_extra_add(handle, "path", "/home/pictures/a b.jpg");
	app_control_extra_add(handle, "mode", "old");
	app_control_extra_add(handle, "mode", "new");
	EXPECT_EQ(launch("setting-storage-efl"), APP_LAUNCH_ERROR_NONE);
	wait_until([&] { return access(output.c_str(), F_OK) == 0; });
	std::stringstream text;
	text << std::ifstream(output).rdbuf();
	EXPECT_EQ(text.str(), "--operation\n" APP_LAUNCH_OPERATION_VIEW "\n--window\n4242\n"
			      "--data\npath=/home/pictures/a b.jpg\n--data\nmode=new\n");

	// The finished launcher is collected by the next request, so that it
	// does not stay behind as a zombie.
	wait_until(zombie_child);
	ASSERT_TRUE(zombie_child());
	EXPECT_EQ(launch("unknown"), APP_LAUNCH_ERROR_APP_NOT_FOUND);
	EXPECT_FALSE(zombie_child());
}

TEST_F(AppControl, RefusesUnknownUnsafeAndIncompleteRequests)
{
	install_launcher("not-executable", 0644);
	install_launcher("escaped");
	app_control_set_operation(handle, APP_LAUNCH_OPERATION_VIEW);
	EXPECT_EQ(app_control_send_launch_request(handle, nullptr, nullptr), APP_LAUNCH_ERROR_INVALID_PARAMETER);
	EXPECT_EQ(launch("setting-storage-efl"), APP_LAUNCH_ERROR_APP_NOT_FOUND);
	EXPECT_EQ(launch("not-executable"), APP_LAUNCH_ERROR_APP_NOT_FOUND);
	// An app id must not reach outside the launcher directory.
	EXPECT_EQ(launch(("../" + launchers.substr(launchers.rfind('/') + 1) + "/escaped").c_str()),
		  APP_LAUNCH_ERROR_INVALID_PARAMETER);
	app_control_set_operation(handle, nullptr);
	EXPECT_EQ(launch("escaped"), APP_LAUNCH_ERROR_INVALID_PARAMETER);
	EXPECT_EQ(access(output.c_str(), F_OK), -1);
}
