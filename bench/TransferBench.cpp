// Moves one archive of a given size up to and back down from an HTTPS server
// on the loopback address, first through the connector (a private backup and
// its restore, as a host makes them), then with curl, and reports the time,
// the throughput and the peak resident memory of each, and how the two
// compare. The archive streams from and to disk on both sides, so memory
// should stay flat whatever the size.
//
//     transfer_bench [SIZE]      SIZE in bytes, or with K, M or G (default 1G)
//
// The server runs inside this process and stores what it receives as it
// arrives (checked against the archive afterwards, outside the measured time).
// The connector's figures are therefore those of client and server together;
// the process's peak during curl's transfers shows the server's share. Linux
// only (/proc, posix_spawn).

#include "LoopbackServer.h"
#include "TestHost.h"
#include "TestTls.h"

#include <DorvanNebiConnector/BackupRestoreComponent.h>
#include <DorvanNebiConnector/DorvanNebiConnector.h>

#include <CoreServices/GlobalUtils.h>
#include <CoreServices/Logger.h>

#include <Poco/Net/HTMLForm.h>
#include <Poco/Net/MessageHeader.h>
#include <Poco/Net/PartHandler.h>
#include <Poco/URI.h>

#include <spawn.h>
#include <sys/wait.h>

#include <chrono>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <functional>
#include <iostream>
#include <sstream>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

extern char** environ;

using namespace TestSupport;

namespace
{
constexpr std::size_t kIoBlock = 64 * 1024;
constexpr double kMiB = 1024.0 * 1024.0;

std::uint64_t ParseSize(const std::string& text)
{
    std::size_t end = 0;
    const double number = std::stod(text, &end);
    std::uint64_t unit = 1;
    const std::string suffix = text.substr(end);
    if (suffix == "K" || suffix == "k")
    {
        unit = 1024;
    }
    else if (suffix == "M" || suffix == "m")
    {
        unit = 1024 * 1024;
    }
    else if (suffix == "G" || suffix == "g")
    {
        unit = 1024 * 1024 * 1024;
    }
    else if (!suffix.empty())
    {
        throw std::invalid_argument("size: a number with K, M or G: " + text);
    }
    return static_cast<std::uint64_t>(number * static_cast<double>(unit));
}

// A memory figure of this process from /proc/self/status ("VmRSS:" for the
// resident memory now, "VmHWM:" for its peak since the last reset), in KiB.
long MemoryKiB(const std::string& field)
{
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);)
    {
        if (line.rfind(field, 0) == 0)
        {
            return std::stol(line.substr(field.size()));
        }
    }
    return -1;
}

long PeakRssKiB()
{
    return MemoryKiB("VmHWM:");
}

void ResetPeakRss()
{
    std::ofstream("/proc/self/clear_refs") << "5";
}

void MakeArchive(const std::string& path, std::uint64_t size)
{
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    std::vector<char> block(kIoBlock);
    std::uint32_t state = 12345;
    for (std::uint64_t written = 0; written < size;)
    {
        for (char& c : block)
        {
            state = state * 1664525u + 1013904223u;
            c = static_cast<char>(state >> 24);
        }
        const std::size_t n = static_cast<std::size_t>(std::min<std::uint64_t>(block.size(), size - written));
        file.write(block.data(), static_cast<std::streamsize>(n));
        written += n;
    }
    if (!file)
    {
        throw std::runtime_error("cannot write " + path);
    }
}

bool SameContent(const std::string& a, const std::string& b)
{
    std::ifstream first(a, std::ios::binary);
    std::ifstream second(b, std::ios::binary);
    std::vector<char> x(kIoBlock);
    std::vector<char> y(kIoBlock);
    while (first && second)
    {
        first.read(x.data(), static_cast<std::streamsize>(x.size()));
        second.read(y.data(), static_cast<std::streamsize>(y.size()));
        if (first.gcount() != second.gcount() || std::memcmp(x.data(), y.data(), first.gcount()) != 0)
        {
            return false;
        }
    }
    return first.eof() && second.eof();
}

void CopyStream(std::istream& in, std::ostream& out)
{
    std::vector<char> block(kIoBlock);
    while (in.read(block.data(), static_cast<std::streamsize>(block.size())) || in.gcount() > 0)
    {
        out.write(block.data(), in.gcount());
    }
}

// Writes the file part of an upload to disk.
class StoreFilePart : public Poco::Net::PartHandler
{
public:
    explicit StoreFilePart(const std::string& path) : m_path(path) {}
    void handlePart(const Poco::Net::MessageHeader&, std::istream& stream) override
    {
        std::ofstream file(m_path, std::ios::binary | std::ios::trunc);
        CopyStream(stream, file);
    }

private:
    std::string m_path;
};

// Takes the file part out of a stored multipart body.
bool ExtractFilePart(const std::string& bodyPath, const std::string& contentType, const std::string& filePath)
{
    Poco::Net::HTTPRequest request(Poco::Net::HTTPRequest::HTTP_POST, "/upload", Poco::Net::HTTPMessage::HTTP_1_1);
    request.setContentType(contentType);
    std::ifstream body(bodyPath, std::ios::binary);
    StoreFilePart store(filePath);
    try
    {
        Poco::Net::HTMLForm form;
        form.load(request, body, store);
        return true;
    }
    catch (const Poco::Exception& e)
    {
        std::cerr << "the stored upload is no form: " << e.displayText() << "\n";
        return false;
    }
}

struct Figures
{
    double seconds = 0;
    long startKiB = 0;     // this process, resident when the transfer began
    long peakKiB = 0;      // this process, peak during the transfer
    long childPeakKiB = 0; // curl's own, for curl's transfers
    bool ok = false;
};

template <typename Transfer>
Figures Measure(Transfer transfer)
{
    ResetPeakRss();
    Figures figures;
    figures.startKiB = MemoryKiB("VmRSS:");
    const auto start = std::chrono::steady_clock::now();
    figures.ok = transfer(figures);
    figures.seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    figures.peakKiB = PeakRssKiB();
    return figures;
}

// Peak resident memory of another running process, in KiB; -1 once it has
// ended.
long PeakRssKiBOf(pid_t pid)
{
    std::ifstream status("/proc/" + std::to_string(pid) + "/status");
    for (std::string line; std::getline(status, line);)
    {
        if (line.rfind("VmHWM:", 0) == 0)
        {
            return std::stol(line.substr(6));
        }
    }
    return -1;
}

// Runs curl with arguments and waits; its own peak memory goes to figures.
// The kernel's own account (wait4's ru_maxrss) would count this process's
// memory too, which the child shared until it became curl; so curl's peak is
// sampled from /proc while it runs (it reaches it early and keeps it).
bool RunCurl(const std::vector<std::string>& arguments, Figures& figures)
{
    std::vector<std::string> all{"curl", "--silent", "--show-error", "--fail", "--cacert",
                                 TestAuthorityFile().utf8_string()};
    all.insert(all.end(), arguments.begin(), arguments.end());
    std::vector<char*> argv;
    for (std::string& argument : all)
    {
        argv.push_back(argument.data());
    }
    argv.push_back(nullptr);
    pid_t pid = 0;
    if (posix_spawnp(&pid, "curl", nullptr, nullptr, argv.data(), environ) != 0)
    {
        std::cerr << "cannot start curl\n";
        return false;
    }
    int status = 0;
    while (waitpid(pid, &status, WNOHANG) == 0)
    {
        figures.childPeakKiB = std::max(figures.childPeakKiB, PeakRssKiBOf(pid));
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    return WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

void Report(const char* name, const Figures& figures, std::uint64_t size)
{
    std::printf("%-20s %8.2f s %9.1f MiB/s   process peak %7.1f MiB (+%5.1f MiB)", name, figures.seconds,
                static_cast<double>(size) / kMiB / figures.seconds, static_cast<double>(figures.peakKiB) / 1024.0,
                static_cast<double>(figures.peakKiB - figures.startKiB) / 1024.0);
    if (figures.childPeakKiB > 0)
    {
        std::printf("   curl peak %7.1f MiB", static_cast<double>(figures.childPeakKiB) / 1024.0);
    }
    std::printf("%s\n", figures.ok ? "" : "   FAILED");
}

void ReportRatio(const char* name, const Figures& connector, const Figures& curl)
{
    std::printf("%-20s connector at %.2f times curl's throughput\n", name, curl.seconds / connector.seconds);
}

// One request through the backup component, from the call to its final
// status on this (the GUI) thread.
template <typename Status>
bool AwaitFinished(boost::signals2::signal<void(Status)>& signal, const std::function<wxString()>& start,
                   Status& final)
{
    bool finished = false;
    boost::signals2::scoped_connection connection = signal.connect([&](Status status) {
        if (status.state == BackupRestoreComponent::Finished)
        {
            final = status;
            finished = true;
        }
    });
    return !start().empty() && RunEventLoopUntil([&] { return finished; }, std::chrono::hours(1)) &&
           final.error == BackupRestoreComponent::NoError;
}
} // namespace

int main(int argc, char** argv)
{
    const std::uint64_t size = ParseSize(argc > 1 ? argv[1] : "1G");
    StartTestHost(1, argv);
    Logging::SetStderrEnabled(false);
    TrustTestAuthority();

    const std::string dir = SandboxDir().utf8_string();
    const std::string source = dir + "/archive.zip";
    const std::string receivedBody = dir + "/received-body";
    const std::string received = dir + "/received.zip";
    const std::string curlDownloadFile = dir + "/curl-download.zip";
    MakeArchive(source, size);

    LoopbackServer server(ServerTlsContext());
    const std::string uploadPath = "/api/clientapp/v1/resource";
    const std::string downloadPath = "/api/clientapp/v1/resource/dorvannebiuserpersonalsetting/";
    // The server stores an upload's body as it comes; the archive is taken
    // out of the form afterwards, outside the measured time.
    std::string uploadContentType;
    server.RouteRaw(uploadPath, [&](Poco::Net::HTTPServerRequest& request, Poco::Net::HTTPServerResponse& response) {
        uploadContentType = request.getContentType();
        std::ofstream body(receivedBody, std::ios::binary | std::ios::trunc);
        CopyStream(request.stream(), body);
        response.setContentType("application/json");
        response.sendBuffer("{}", 2);
    });
    const auto uploadArrivedWhole = [&] {
        const bool same = ExtractFilePart(receivedBody, uploadContentType, received) && SameContent(source, received);
        std::remove(receivedBody.c_str());
        std::remove(received.c_str());
        return same;
    };
    server.RouteRaw(downloadPath, [&](Poco::Net::HTTPServerRequest&, Poco::Net::HTTPServerResponse& response) {
        response.sendFile(source, "application/zip");
    });
    const std::string base = "https://localhost:" + std::to_string(server.Port());
    Poco::URI uploadUri(base + uploadPath);
    Poco::URI downloadUri(base + downloadPath);

    // The local agent hands out the credentials of every cloud request.
    LoopbackServer agent;
    agent.Route("/api/v1/nebilogin", Reply::Json(R"({"isLoginSuccess":"yes","apiKey":"k","apiSceret":"s"})"));
    WriteCloudConfig("{\"quarlport\": \"" + std::to_string(agent.Port()) +
                     "\", \"nebidomain\": \"localhost\", \"nebiport\": \"" + std::to_string(server.Port()) + "\"}");
    DorvanNebiConnectorContext::InitializeDorvanNebiConnector();
    BackupRestoreComponent& backups = *DorvanNebiConnector::GetInstance()->GetBackupRestoreComponent();

    std::printf("transfer of %llu bytes (%.2f MiB) over HTTPS on the loopback address\n",
                static_cast<unsigned long long>(size), static_cast<double>(size) / kMiB);
    std::printf("process peak before the transfers: %.1f MiB\n", static_cast<double>(PeakRssKiB()) / 1024.0);

    Figures upload = Measure([&](Figures&) {
        BackupRestoreComponent::BackupStatus final;
        return AwaitFinished<BackupRestoreComponent::BackupStatus>(
            backups.m_sigBackupStatus,
            [&] { return backups.BackupToPrivateSpace(wxString::FromUTF8(source), false); }, final);
    });
    upload.ok = upload.ok && uploadArrivedWhole();
    Report("connector upload", upload, size);

    BackupRestoreComponent::RestoreStatus restored;
    Figures download = Measure([&](Figures&) {
        return AwaitFinished<BackupRestoreComponent::RestoreStatus>(
            backups.m_sigRestoreStatus, [&] { return backups.RestoreFromPrivateSpace(); }, restored);
    });
    const std::string downloaded = restored.filePath.utf8_string();
    download.ok = download.ok && SameContent(source, downloaded);
    Report("connector download", download, size);
    std::remove(downloaded.c_str());

    Figures curlUpload = Measure([&](Figures& figures) {
        return RunCurl({"-o", "/dev/null", "-F", "type=bench", "-F", "file=@" + source, uploadUri.toString()},
                       figures);
    });
    curlUpload.ok = curlUpload.ok && uploadArrivedWhole();
    Report("curl upload", curlUpload, size);

    Figures curlDownload = Measure([&](Figures& figures) {
        return RunCurl({"-o", curlDownloadFile, downloadUri.toString()}, figures);
    });
    curlDownload.ok = curlDownload.ok && SameContent(source, curlDownloadFile);
    Report("curl download", curlDownload, size);
    ReportRatio("upload", upload, curlUpload);
    ReportRatio("download", download, curlDownload);

    agent.Stop();
    server.Stop();
    StopTestHost();
    return upload.ok && download.ok && curlUpload.ok && curlDownload.ok ? 0 : 1;
}
