#include "store/S3Store.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <string_view>
#include <thread>
#include <utility>

#include "store/Sha256.h"

namespace zmcstore {
namespace {

constexpr std::size_t kMostWord = 1024;  // of what a store calls things by
constexpr std::size_t kMostMessage = 300;
constexpr double kLongestPause = 30;

bool IsWord(std::string_view text) {
    return !text.empty() && text.size() <= kMostWord &&
           std::ranges::all_of(text, [](char c) { return c > ' ' && c < 0x7F && c != '<'; });
}

// The text of the first element of that name; empty if there is none.
std::string ElementText(std::string_view document, std::string_view element) {
    const std::string open = '<' + std::string(element) + '>';
    const std::size_t begin = document.find(open);
    if (begin == document.npos) return "";
    const std::size_t end = document.find("</" + std::string(element) + '>', begin);
    if (end == document.npos) return "";
    std::string text(document.substr(begin + open.size(), end - begin - open.size()));
    constexpr std::array<std::pair<std::string_view, char>, 5> kEntities{
        {{"&quot;", '"'}, {"&lt;", '<'}, {"&gt;", '>'}, {"&apos;", '\''}, {"&amp;", '&'}}};
    for (const auto& [entity, sign] : kEntities)
        for (std::size_t at = text.find(entity); at != text.npos; at = text.find(entity, at + 1))
            text.replace(at, entity.size(), 1, sign);
    return text;
}

bool IsError(const HttpAnswer& answer) { return answer.text.find("<Error>") != answer.text.npos; }

std::string CodeOf(const HttpAnswer& answer) {
    return IsError(answer) ? ElementText(answer.text, "Code") : "";
}

bool IsGood(const HttpAnswer& answer) {
    return answer.status >= 200 && answer.status < 300 && !IsError(answer);
}

bool MayPass(const HttpAnswer& answer) {
    const std::string code = CodeOf(answer);
    return answer.status >= 500 || answer.status == 429 || code == "SlowDown" ||
           code == "InternalError" || code == "RequestTimeout" || code == "ServiceUnavailable";
}

// What the reader of a message may do about it.
std::string Advice(long status, const std::string& code) {
    if (code == "NoSuchBucket") return "; make the bucket, or name another one";
    if (code == "InvalidPart" || code == "InvalidPartOrder" || code == "EntityTooSmall")
        return "; the store has other parts than were sent, or takes no such sizes: make the parts "
               "again, or plan again";
    if (status == 301 || status == 307)
        return "; look at AWS_REGION, AWS_S3_ENDPOINT and AWS_VIRTUAL_HOSTING";
    if (status == 401 || status == 403)
        return "; look at AWS_ACCESS_KEY_ID and AWS_SECRET_ACCESS_KEY, and at what they may do";
    if (status >= 500 || status == 429) return "; try again later";
    return "";
}

// Of bytes that are sent, which the store compares; empty if they cannot be read.
std::string DigestOf(const std::string& text, const Body* body) {
    Sha256 digest;
    digest.Add(text.data(), text.size());
    std::vector<char> buffer(body ? std::size_t{256} << 10 : 0);
    for (std::uint64_t done = 0; body && done < body->size;) {
        const auto size =
            static_cast<std::size_t>(std::min<std::uint64_t>(buffer.size(), body->size - done));
        if (body->source->ReadAt(body->offset + done, buffer.data(), size) != size) return "";
        digest.Add(buffer.data(), size);
        done += size;
    }
    return digest.Finish();
}

std::string UploadQuery(const std::string& upload) {
    return "uploadId=" + HttpClient::Escaped(upload, false);
}

std::string ListOf(std::span<const UploadedPart> parts) {
    std::string text = "<CompleteMultipartUpload>";
    for (const UploadedPart& part : parts) {
        text += "<Part><PartNumber>" + std::to_string(part.number) + "</PartNumber><ETag>";
        for (const char c : part.tag) {
            if (c == '"')
                text += "&quot;";
            else if (c == '&')
                text += "&amp;";
            else
                text += c;
        }
        text += "</ETag></Part>";
    }
    return text + "</CompleteMultipartUpload>";
}

}  // namespace

S3Store::S3Store(std::string objectName, const S3Settings& storeSettings)
    : name(std::move(objectName)), settings(storeSettings), client(storeSettings.http) {}

HttpRequest S3Store::RequestFor(const Question& question) const {
    HttpRequest request{question.method, settings.address + '/', question.headers, question.text,
                        question.body};
    request.url += HttpClient::Escaped(settings.key + question.ending, true);
    if (!question.query.empty()) request.url += '?' + question.query;
    if (!settings.token.empty())
        request.headers.push_back("x-amz-security-token: " + settings.token);
    if (settings.requesterPays) request.headers.emplace_back("x-amz-request-payer: requester");
    const std::string digest = DigestOf(question.text, question.body);
    if (digest.empty())
        throw zmchost::Error(name, question.purpose, "what is to be sent cannot be read");
    request.headers.push_back("x-amz-content-sha256: " + digest);
    return request;
}

// One attempt: nothing where it may go better the next time, unless it is the last.
std::optional<HttpAnswer> S3Store::AskOnce(const Question& question, const HttpRequest& request,
                                           bool isLast) {
    try {
        HttpAnswer answer = client.Ask(request);
        if (MayPass(answer) && !isLast) return std::nullopt;
        return answer;
    } catch (const NoAnswer& none) {
        if (none.cause == NoAnswer::Cause::Cancelled)
            throw zmchost::Cancelled(name, question.purpose);
        if (none.cause == NoAnswer::Cause::Passing && !isLast) return std::nullopt;
        throw zmchost::Error(name, question.purpose,
                             std::string(none.what()) +
                                 "; look at AWS_S3_ENDPOINT and AWS_HTTPS, or try again later");
    }
}

void S3Store::Pause(const Question& question, std::uint32_t attempt) const {
    using Clock = std::chrono::steady_clock;
    double seconds = settings.pauseSeconds;
    for (std::uint32_t i = 0; i < attempt && seconds < kLongestPause; ++i) seconds *= 2;
    const auto end = Clock::now() + std::chrono::duration<double>(std::min(seconds, kLongestPause));
    while (Clock::now() < end) {
        if (settings.http.cancelled && settings.http.cancelled())
            throw zmchost::Cancelled(name, question.purpose);
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
}

HttpAnswer S3Store::Ask(const Question& question) {
    const HttpRequest request = RequestFor(question);
    for (std::uint32_t attempt = 0;; ++attempt) {
        const bool isLast = attempt == settings.retries;
        if (auto answer = AskOnce(question, request, isLast)) return std::move(*answer);
        Pause(question, attempt);
    }
}

void S3Store::Refuse(const Question& question, const HttpAnswer& answer) const {
    const std::string code = CodeOf(answer);
    if (code == "NoSuchUpload")
        throw UploadGone(name, question.purpose,
                         "the store does not know the upload any more (NoSuchUpload); plan again "
                         "with --overwrite");
    std::string reason = "the store answers " + std::to_string(answer.status);
    if (IsWord(code))
        reason += ", " + code + ": " + ElementText(answer.text, "Message").substr(0, kMostMessage);
    else if (IsGood(answer))
        reason += " and not what was asked for";
    throw zmchost::Error(name, question.purpose, reason + Advice(answer.status, code));
}

ObjectState S3Store::Look() {
    const Question question{"HEAD", "", "look whether it is there"};
    HttpAnswer answer = Ask(question);
    if (answer.status == 404) return {};
    if (!IsGood(answer) || !IsWord(answer.tag)) Refuse(question, answer);
    return {true, std::move(answer.tag), std::move(answer.mark)};
}

std::string S3Store::Begin(const std::string& mark) {
    const Question question{
        "POST",
        "uploads=",
        "begin its upload",
        "",
        {"x-amz-meta-zmcraster: " + mark, "Content-Type: application/octet-stream"}};
    const HttpAnswer answer = Ask(question);
    std::string upload = ElementText(answer.text, "UploadId");
    if (!IsGood(answer) || !IsWord(upload)) Refuse(question, answer);
    return upload;
}

UploadedPart S3Store::PutPart(const std::string& upload, std::uint32_t number, const Body& body) {
    Question question{"PUT", "partNumber=" + std::to_string(number) + '&' + UploadQuery(upload),
                      "send part " + std::to_string(number) + " of its upload"};
    question.body = &body;
    HttpAnswer answer = Ask(question);
    if (!IsGood(answer) || !IsWord(answer.tag)) Refuse(question, answer);
    return {number, std::move(answer.tag)};
}

void S3Store::Complete(const std::string& upload, std::span<const UploadedPart> parts) {
    Question question{"POST", UploadQuery(upload), "complete its upload"};
    question.headers.emplace_back("Content-Type: application/xml");
    question.text = ListOf(parts);
    const HttpAnswer answer = Ask(question);
    // The store may answer before it is done, and tell in the text how that ended.
    if (!IsGood(answer) || ElementText(answer.text, "ETag").empty()) Refuse(question, answer);
}

void S3Store::Abort(const std::string& upload) {
    const Question question{"DELETE", UploadQuery(upload), "end its upload"};
    const HttpAnswer answer = Ask(question);
    if (!IsGood(answer)) Refuse(question, answer);
}

void S3Store::PutBeside(const std::string& ending, const Body& body) {
    Question question{"PUT", "", "put " + ending + " beside it", ending};
    question.body = &body;
    const HttpAnswer answer = Ask(question);
    if (!IsGood(answer) || !IsWord(answer.tag)) Refuse(question, answer);
}

void S3Store::RemoveBeside(const std::string& ending) {
    const Question question{"DELETE", "", "remove " + ending + " beside it", ending};
    const HttpAnswer answer = Ask(question);
    if (!IsGood(answer) && answer.status != 404) Refuse(question, answer);
}

}  // namespace zmcstore
