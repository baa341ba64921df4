// Communication logging: the producer's cost through the log file server, the worker's sustained
// throughput, and the hex dump alone.
#include "bench.h"

#include <ostrand/logging/LogFile.h>
#include <ostrand/logging/LogFileServer.h>

#include <psapi.h>

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <string>
#include <thread>
#include <vector>

namespace
{

std::wstring BenchFolder()
{
    wchar_t temp[MAX_PATH] = {};
    ::GetTempPathW(MAX_PATH, temp);
    std::wstring folder =
        std::wstring(temp) + L"ostrand-bench-logging-" + std::to_wstring(::GetCurrentProcessId());
    ::CreateDirectoryW(folder.c_str(), NULL);
    return folder;
}

void RemoveBenchFolder(const std::wstring& folder)
{
    WIN32_FIND_DATAW data;
    HANDLE h = ::FindFirstFileW((folder + L"\\*.log").c_str(), &data);
    if (h != INVALID_HANDLE_VALUE)
    {
        do
            ::DeleteFileW((folder + L"\\" + data.cFileName).c_str());
        while (::FindNextFileW(h, &data));
        ::FindClose(h);
    }
    ::RemoveDirectoryW(folder.c_str());
}

unsigned long long FileSize(const std::wstring& path)
{
    WIN32_FILE_ATTRIBUTE_DATA data;
    if (!::GetFileAttributesExW(path.c_str(), GetFileExInfoStandard, &data))
        return 0;
    return (static_cast<unsigned long long>(data.nFileSizeHigh) << 32) | data.nFileSizeLow;
}

std::wstring FindLog(const std::wstring& folder, const std::wstring& prefix)
{
    WIN32_FIND_DATAW data;
    HANDLE h = ::FindFirstFileW((folder + L"\\" + prefix + L"-*.log").c_str(), &data);
    if (h == INVALID_HANDLE_VALUE)
        return std::wstring();
    ::FindClose(h);
    return folder + L"\\" + data.cFileName;
}

double Percentile(std::vector<double> v, double p)
{
    std::sort(v.begin(), v.end());
    return v[static_cast<size_t>(p * static_cast<double>(v.size() - 1))];
}

// What the producer must do at the least: take the local time, copy the bytes, append under a lock.
struct BaselineEntry
{
    SYSTEMTIME time;
    std::vector<unsigned char> data;
};

} // namespace

BENCHMARK("logging: producer LogSentData 64 B via server")
{
    using ostrand::CLogFileServer;
    const std::wstring folder = BenchFolder();
    CLogFileServer& server = CLogFileServer::Ref();
    const CLogFileServer::LogFileDetail saved = server.GetDetail();
    server.SetDetail(CLogFileServer::DetailNormal);
    const unsigned __int64 channel = 0x5EED;
    if (!server.CreateLogFile(channel, (folder + L"\\producer").c_str()))
    {
        std::printf("cannot create the log file\n");
        return;
    }
    unsigned char payload[64];
    for (int i = 0; i < 64; ++i)
        payload[i] = static_cast<unsigned char>(i * 37);

    ostrand::CCriticalSection cs;
    std::vector<BaselineEntry> queue;

    // Batches of calls between counter reads keep the timer's own cost out of the figures; the worker
    // writes concurrently, as it would in an application.
    const int kBatches = 4000, kPerBatch = 25;
    std::vector<double> server_ns, base_ns;
    for (int round = 0; round < kBatches; ++round)
    {
        double t0 = bench::Now();
        for (int i = 0; i < kPerBatch; ++i)
            server.LogSentData(channel, payload, sizeof(payload), true);
        server_ns.push_back((bench::Now() - t0) * 1e9 / kPerBatch);

        t0 = bench::Now();
        for (int i = 0; i < kPerBatch; ++i)
        {
            BaselineEntry e;
            ::GetLocalTime(&e.time);
            e.data.assign(payload, payload + sizeof(payload));
            cs.Lock(true);
            queue.push_back(std::move(e));
            cs.Unlock();
        }
        base_ns.push_back((bench::Now() - t0) * 1e9 / kPerBatch);
        if (queue.size() > 20000)
            queue.clear(); // keep the baseline's memory in line with the drained log queue
    }
    server.CloseLogFile(channel);
    server.SetDetail(saved);
    RemoveBenchFolder(folder);

    const double med = Percentile(server_ns, 0.5), p99 = Percentile(server_ns, 0.99);
    const double baseMed = Percentile(base_ns, 0.5), base99 = Percentile(base_ns, 0.99);
    std::printf("per call (batches of %d): server median %.0f ns, p99 %.0f ns; baseline median %.0f ns, "
                "p99 %.0f ns\n",
                kPerBatch, med, p99, baseMed, base99);
    bench::Report("LogSentData 64 B median (per call)", med * 1e-9, baseMed * 1e-9, "time+copy+append");
    bench::Report("LogSentData 64 B p99 (per call)", p99 * 1e-9, base99 * 1e-9, "time+copy+append");
}

BENCHMARK("logging: worker throughput 4 channels x 64 B for 5 s")
{
    using ostrand::CLogFileServer;
    const std::wstring folder = BenchFolder();
    CLogFileServer& server = CLogFileServer::Ref();
    const CLogFileServer::LogFileDetail saved = server.GetDetail();
    server.SetDetail(CLogFileServer::DetailNormal);
    const int kChannels = 4;
    std::vector<std::wstring> paths;
    for (int c = 0; c < kChannels; ++c)
    {
        const std::wstring prefix = L"throughput" + std::to_wstring(c);
        if (!server.CreateLogFile(0x7000 + c, (folder + L"\\" + prefix).c_str()))
        {
            std::printf("cannot create the log files\n");
            return;
        }
        paths.push_back(FindLog(folder, prefix));
    }
    unsigned char payload[64];
    for (int i = 0; i < 64; ++i)
        payload[i] = static_cast<unsigned char>(i * 37);
    // Every block of the run has the same size: the header and two dump lines.
    SYSTEMTIME now;
    ::GetLocalTime(&now);
    char stamp[64];
    const int stampLength =
        std::snprintf(stamp, sizeof(stamp), "%u/%u/%u, %02u:%02u:%02u.%03u", now.wYear, now.wMonth, now.wDay,
                      now.wHour, now.wMinute, now.wSecond, now.wMilliseconds);
    const double blockBytes = double(std::strlen("SYNC WRITE request completed: 64 (0x40) bytes, ") +
                                     stampLength + 2 + 2 * (1 + 96 + 4 + 32 + 2) + 2);

    std::atomic<bool> stop(false);
    std::vector<std::atomic<unsigned long long>> produced(kChannels);
    std::vector<std::thread> producers;
    for (int c = 0; c < kChannels; ++c)
    {
        produced[c] = 0;
        producers.emplace_back(
            [&, c]
            {
                while (!stop.load(std::memory_order_relaxed))
                {
                    server.LogSentData(0x7000 + c, payload, sizeof(payload), true);
                    produced[c].fetch_add(1, std::memory_order_relaxed);
                }
            });
    }
    // Sample the backlog (queued minus written) and the memory while the producers run.
    double peakBacklog = 0;
    size_t peakWorkingSet = 0, peakPrivate = 0;
    const double t0 = bench::Now();
    while (bench::Now() - t0 < 5.0)
    {
        ::Sleep(20);
        for (int c = 0; c < kChannels; ++c)
        {
            const double written = double(FileSize(paths[size_t(c)])) / blockBytes;
            peakBacklog = std::max(peakBacklog, double(produced[c].load()) - written);
        }
    }
    stop = true;
    for (std::thread& t : producers)
        t.join();
    const double producing = bench::Now() - t0;
    unsigned long long total = 0;
    for (int c = 0; c < kChannels; ++c)
        total += produced[c].load();
    for (int c = 0; c < kChannels; ++c)
        server.CloseLogFile(0x7000 + c);
    const double drained = bench::Now() - t0;
    PROCESS_MEMORY_COUNTERS pmc = {};
    pmc.cb = sizeof(pmc);
    if (::GetProcessMemoryInfo(::GetCurrentProcess(), &pmc, sizeof(pmc)))
    {
        peakWorkingSet = pmc.PeakWorkingSetSize;
        peakPrivate = pmc.PeakPagefileUsage;
    }
    unsigned long long fileBytes = 0;
    for (const std::wstring& p : paths)
        fileBytes += FileSize(p);
    server.SetDetail(saved);
    RemoveBenchFolder(folder);

    const double payloadMB = double(total) * 64 / 1e6;
    std::printf("%llu blocks of 64 B in %.2f s of producing, all written after %.2f s (%.1f MB of log text, "
                "%s)\n",
                total, producing, drained, double(fileBytes) / 1e6,
                double(fileBytes) == double(total) * blockBytes ? "every block present" : "BLOCKS MISSING");
    std::printf(
        "sustained payload %.1f MB/s (goal >= 20 MB/s), log text %.1f MB/s; peak backlog %.0f entries "
        "on one channel; peak working set %.1f MB, peak private %.1f MB\n",
        payloadMB / drained, double(fileBytes) / 1e6 / drained, peakBacklog, double(peakWorkingSet) / 1e6,
        double(peakPrivate) / 1e6);
}

namespace
{
// The obvious dump: one swprintf per byte. The library must do far better.
ostrand::ustring NaiveBin2Text(const std::vector<unsigned char>& data, size_t perLine)
{
    ostrand::ustring text;
    wchar_t cell[8];
    for (size_t at = 0; at < data.size(); at += perLine)
    {
        const size_t n = std::min(perLine, data.size() - at);
        text += L" ";
        for (size_t i = 0; i < perLine; ++i)
        {
            if (i < n)
            {
                _snwprintf(cell, 8, L"%02X ", data[at + i]);
                text += cell;
            }
            else
                text += L"   ";
        }
        text += L"    ";
        for (size_t i = 0; i < n; ++i)
            text += isgraph(data[at + i]) ? wchar_t(data[at + i]) : L'.';
        text += L"\r\n";
    }
    return text;
}

std::vector<unsigned char> Bin2TextInput()
{
    // run_bin2text_vs_xxd.sh hands over the very bytes that xxd read.
    std::vector<unsigned char> data;
    if (const char* path = std::getenv("OSTRAND_BENCH_BIN2TEXT_FILE"))
    {
        HANDLE h = ::CreateFileA(path, GENERIC_READ, FILE_SHARE_READ, NULL, OPEN_EXISTING, 0, NULL);
        if (h != INVALID_HANDLE_VALUE)
        {
            LARGE_INTEGER size;
            ::GetFileSizeEx(h, &size);
            data.resize(static_cast<size_t>(size.QuadPart));
            DWORD n = 0;
            if (!::ReadFile(h, data.data(), static_cast<DWORD>(data.size()), &n, NULL) || n != data.size())
                data.clear();
            ::CloseHandle(h);
        }
        if (data.empty())
            std::printf("cannot read %s; using generated bytes\n", path);
    }
    if (data.empty())
    {
        data.resize(16 << 20);
        unsigned x = 12345;
        for (unsigned char& b : data)
        {
            x = x * 1103515245u + 12345u;
            b = static_cast<unsigned char>(x >> 16);
        }
    }
    return data;
}
} // namespace

BENCHMARK("logging: Bin2Text")
{
    const std::vector<unsigned char> data = Bin2TextInput();
    const double mb = double(data.size()) / 1e6;
    size_t length = 0;
    const double lib = bench::BestOf(5,
                                     [&]
                                     {
                                         const ostrand::ustring text = ostrand::CLogFile::Bin2Text(data, 32);
                                         length = text.size();
                                         bench::Keep(text);
                                     });
    const double naive = bench::BestOf(2, [&] { bench::Keep(NaiveBin2Text(data, 32)); });
    std::printf("Bin2Text of %.1f MB: %.0f MB/s of input (goal >= 100 MB/s), %zu characters out\n", mb,
                mb / lib, length);
    bench::Report("Bin2Text", lib, naive, "swprintf per byte");
    if (const char* xxd = std::getenv("OSTRAND_BENCH_XXD_SECONDS"))
    {
        const double xxdSeconds = std::atof(xxd);
        if (xxdSeconds > 0)
        {
            std::printf("xxd on the same bytes: %.0f MB/s of input\n", mb / xxdSeconds);
            bench::Report("Bin2Text", lib, xxdSeconds, "xxd (Linux, same bytes)");
        }
    }
}
