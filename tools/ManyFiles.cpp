#include "ManyFiles.h"

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <cstdio>
#include <mutex>
#include <thread>

#include "Diagnostics.h"
#include "ExitCode.h"

namespace kest::tool {

unsigned DefaultJobs() { return std::max(1u, std::thread::hardware_concurrency()); }

void AddJobsOption(CLI::App& command, unsigned& jobs) {
    jobs = DefaultJobs();
    command.add_option("-j,--jobs", jobs, "files handled at once (default: the number of cores)")
        ->type_name("N")
        ->check(CLI::Range(1u, 1024u));
}

namespace {

int RunGuarded(const std::function<int(std::size_t, const std::string&)>& run, std::size_t index,
               const std::string& file) {
    try {
        return run(index, file);
    } catch (const std::exception& error) {
        ReportError(DisplayName(file), error.what());
    } catch (...) {
        ReportError(DisplayName(file), "unexpected failure");
    }
    return kExitCannotLoad;
}

}  // namespace

int RunEachFile(const std::vector<std::string>& files, unsigned jobs,
                const std::function<int(std::size_t, const std::string&)>& run) {
    int worst = kExitOk;
    const std::size_t workers = std::min<std::size_t>(std::max(jobs, 1u), files.size());
    if (workers <= 1) {
        for (std::size_t i = 0; i < files.size(); ++i)
            worst = std::max(worst, RunGuarded(run, i, files[i]));
        return worst;
    }
    std::vector<CapturedOutput> outputs(files.size());
    std::vector<int> codes(files.size(), kExitOk);
    std::vector<char> done(files.size(), 0);
    std::mutex mutex;
    std::condition_variable finished;
    std::atomic<std::size_t> next{0};
    std::vector<std::thread> threads;
    for (std::size_t w = 0; w < workers; ++w) {
        threads.emplace_back([&] {
            for (std::size_t i = next++; i < files.size(); i = next++) {
                CaptureOutput(&outputs[i]);
                const int code = RunGuarded(run, i, files[i]);
                CaptureOutput(nullptr);
                std::lock_guard<std::mutex> lock(mutex);
                codes[i] = code;
                done[i] = 1;
                finished.notify_all();
            }
        });
    }
    for (std::size_t i = 0; i < files.size(); ++i) {
        CapturedOutput output;
        {
            std::unique_lock<std::mutex> lock(mutex);
            finished.wait(lock, [&] { return done[i] != 0; });
            output = std::move(outputs[i]);
            worst = std::max(worst, codes[i]);
        }
        std::fflush(stderr);
        Print(output.out);
        std::fflush(stdout);
        PrintError(output.err);
    }
    for (std::thread& thread : threads) thread.join();
    return worst;
}

}  // namespace kest::tool
