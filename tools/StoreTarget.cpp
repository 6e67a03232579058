#include "tools/StoreTarget.h"

#include <cpl_conv.h>
#include <cpl_vsi.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>

#include "host/base/Text.h"
#include "platform/Interrupts.h"
#include "store/S3Store.h"
#include "tools/Message.h"

namespace zmctools {
namespace {

constexpr const char* kUrl = "s3://";
constexpr const char* kGdalPath = "/vsis3/";
constexpr const char* kUsualHost = "s3.amazonaws.com";
constexpr std::size_t kMostKeyBytes = 1024;

struct ObjectName {
    std::string bucket;
    std::string key;
};

ObjectName Parse(const std::string& name) {
    const std::string path =
        name.substr(std::string(name.starts_with(kUrl) ? kUrl : kGdalPath).size());
    const std::size_t slash = path.find('/');
    ObjectName object{path.substr(0, slash), slash == path.npos ? "" : path.substr(slash + 1)};
    const bool plain = std::ranges::all_of(object.bucket, [](char c) {
        return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
               c == '-' || c == '.' || c == '_';
    });
    if (object.bucket.empty() || !plain || object.key.empty() || object.key.ends_with('/') ||
        object.key.size() > kMostKeyBytes)
        throw Failure(name, "it names no object; one is named s3://BUCKET/KEY");
    return object;
}

// GDAL's setting for this object, or for all.
class Settings {
public:
    explicit Settings(const ObjectName& object)
        : path(kGdalPath + object.bucket + '/' + object.key) {}

    std::string Text(const char* name, const char* usual = "") const {
        return VSIGetPathSpecificOption(path.c_str(), name, usual);
    }
    bool IsSet(const char* name, bool usual) const {
        return CPLTestBool(Text(name, usual ? "YES" : "NO").c_str());
    }
    double Number(const char* name, double usual, double most) const {
        const std::string text = Text(name);
        const double value = text.empty() ? usual : CPLAtof(text.c_str());
        return std::isfinite(value) ? std::clamp(value, 0.0, most) : usual;
    }

private:
    const std::string path;
};

std::string RegionOf(const Settings& settings) {
    const std::string region = settings.Text("AWS_REGION");
    return region.empty() ? settings.Text("AWS_DEFAULT_REGION", "us-east-1") : region;
}

std::string AddressOf(const std::string& name, const ObjectName& object, const Settings& settings) {
    std::string host = settings.Text("AWS_S3_ENDPOINT", kUsualHost);
    std::string scheme = settings.IsSet("AWS_HTTPS", true) ? "https://" : "http://";
    for (const char* const given : {"https://", "http://"})
        if (host.starts_with(given)) {
            scheme = given;
            host.erase(0, scheme.size());
        }
    while (host.ends_with('/')) host.pop_back();
    if (host.empty() || host.find_first_of("/?#@ \t\r\n") != host.npos)
        throw Failure(name, "AWS_S3_ENDPOINT names no server; one is named HOST or HOST:PORT");
    const std::string region = RegionOf(settings);
    if (host == kUsualHost && region != "us-east-1") host = "s3." + region + ".amazonaws.com";
    const bool dotted = object.bucket.find('.') != object.bucket.npos;
    return settings.IsSet("AWS_VIRTUAL_HOSTING", !dotted) ? scheme + object.bucket + '.' + host
                                                          : scheme + host + '/' + object.bucket;
}

bool HasControl(const std::string& text) {
    return std::ranges::any_of(text, [](char c) { return static_cast<unsigned char>(c) < ' '; });
}

zmcstore::HttpSettings HttpOf(const std::string& name, const Settings& settings) {
    zmcstore::HttpSettings http;
    http.region = RegionOf(settings);
    http.authorities = settings.Text("CURL_CA_BUNDLE");
    http.anyAuthority = settings.IsSet("GDAL_HTTP_UNSAFESSL", false);
    constexpr double kDay = 86400;
    http.connectSeconds =
        std::max(1L, std::lround(settings.Number("GDAL_HTTP_CONNECTTIMEOUT", 30, kDay)));
    http.silentSeconds =
        std::max(1L, std::lround(settings.Number("GDAL_HTTP_LOW_SPEED_TIME", 120, kDay)));
    http.cancelled = &platform::IsInterrupted;
    if (settings.IsSet("AWS_NO_SIGN_REQUEST", false)) return http;
    http.keyId = settings.Text("AWS_ACCESS_KEY_ID");
    http.secret = settings.Text("AWS_SECRET_ACCESS_KEY");
    if (http.keyId.empty() || http.secret.empty())
        throw Failure(name,
                      "set AWS_ACCESS_KEY_ID and AWS_SECRET_ACCESS_KEY, or AWS_NO_SIGN_REQUEST=YES "
                      "for a store that wants none");
    if (HasControl(http.keyId) || HasControl(http.secret) || HasControl(http.region))
        throw Failure(name, "its keys or its region have a character that no key has");
    return http;
}

}  // namespace

bool IsObjectName(const std::string& name) {
    return name.starts_with(kUrl) || name.starts_with(kGdalPath);
}

std::string LastNameOf(const std::string& object) {
    const std::string key = Parse(object).key;
    return key.substr(key.rfind('/') + 1);
}

std::unique_ptr<zmcstore::ObjectStore> OpenStore(const std::string& object) {
    const ObjectName name = Parse(object);
    const Settings settings(name);
    zmcstore::S3Settings made;
    made.http = HttpOf(object, settings);
    made.address = AddressOf(object, name, settings);
    made.key = name.key;
    if (!made.http.keyId.empty()) made.token = settings.Text("AWS_SESSION_TOKEN");
    if (HasControl(made.token)) throw Failure(object, "AWS_SESSION_TOKEN is none");
    made.requesterPays = settings.Text("AWS_REQUEST_PAYER") == "requester";
    made.retries = static_cast<std::uint32_t>(settings.Number("GDAL_HTTP_MAX_RETRY", 5, 100));
    made.pauseSeconds = settings.Number("GDAL_HTTP_RETRY_DELAY", 1, 600);
    return std::make_unique<zmcstore::S3Store>(object, made);
}

}  // namespace zmctools
