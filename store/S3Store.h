// S3Store: an object of a store that speaks the S3 protocol, as many do.
//
// Bytes are signed for with their digest, so that the store takes nothing else for them: a body is
// read twice. What a busy store or a broken connection left undone is tried again after growing
// pauses.
#ifndef ZMC_STORE_S3STORE_H
#define ZMC_STORE_S3STORE_H

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "store/HttpClient.h"
#include "store/ObjectStore.h"

namespace zmcstore {

struct S3Settings {
    HttpSettings http;
    std::string address;  // of the bucket: "https://host:port/bucket", without a slash at its end
    std::string key;      // UTF-8
    std::string token;    // of a session; empty: none
    bool requesterPays = false;
    std::uint32_t retries = 5;
    double pauseSeconds = 1;  // before the first of them; twice as long before each further one
};

class S3Store final : public ObjectStore {
public:
    // `objectName` stands for the object in messages.
    S3Store(std::string objectName, const S3Settings& storeSettings);

    ObjectState Look() override;
    std::string Begin(const std::string& mark) override;
    UploadedPart PutPart(const std::string& upload, std::uint32_t number,
                         const Body& body) override;
    void Complete(const std::string& upload, std::span<const UploadedPart> parts) override;
    void Abort(const std::string& upload) override;
    void PutBeside(const std::string& ending, const Body& body) override;
    void RemoveBeside(const std::string& ending) override;

private:
    const std::string name;
    const S3Settings settings;
    HttpClient client;

    // What is asked, of which object beside or this one, and what it is for: words behind "cannot".
    struct Question {
        const char* method;
        std::string query;
        std::string purpose;
        std::string ending = {};
        std::vector<std::string> headers = {};
        std::string text = {};
        const Body* body = nullptr;
    };
    HttpRequest RequestFor(const Question& question) const;
    HttpAnswer Ask(const Question& question);
    std::optional<HttpAnswer> AskOnce(const Question& question, const HttpRequest& request,
                                      bool isLast);
    void Pause(const Question& question, std::uint32_t attempt) const;
    [[noreturn]] void Refuse(const Question& question, const HttpAnswer& answer) const;
};

}  // namespace zmcstore

#endif
