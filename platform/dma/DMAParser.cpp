#include "platform/dma/DMAParser.h"

#include <syslog.h>

#include <algorithm>
#include <chrono>
#include <climits>

#include "platform/dma/HttpPost.h"
#include "platform/dma/SoapBrowse.h"
#include "platform/plugin/Plugin.h"

namespace {

using Clock = std::chrono::steady_clock;

// Collects one reply body and aborts the transfer as soon as it passes the size limit.
struct ReplyBuffer {
    std::string data;
    bool tooLarge = false;
};

int AppendToReply(void* context, const char* bytes, size_t size) {
    auto* reply = static_cast<ReplyBuffer*>(context);
    if (size > harmona::dma::kMaxReplyBytes - reply->data.size()) {
        reply->tooLarge = true;
        return 1;
    }
    reply->data.append(bytes, size);
    return 0;
}

// Reserves the announced size at once (a 2 MiB reply grown by doubling is copied about ten times);
// beyond the size limit nothing is reserved, the sink refuses the bytes as they come.
void ExpectReplySize(void* context, unsigned long long size) {
    auto* reply = static_cast<ReplyBuffer*>(context);
    if (size <= harmona::dma::kMaxReplyBytes)
        reply->data.reserve(static_cast<std::size_t>(size));
}

}  // namespace

DMAParser::~DMAParser() {
    Clear();
}

void DMAParser::Clear() {
    for (ItemNode* item : items_)
        delete item;
    items_.clear();
    hasResult_ = false;
    totalMatches_ = 0;
}

int DMAParser::Fail(std::string why) {
    Clear();
    error_ = std::move(why);
    return 1;
}

int DMAParser::Refuse(const DMABrowse& browse, const std::string& why) {
    syslog(LOG_ERR, "browse: object %s of %s refused: %s", browse.objectId.c_str(),
           browse.ControlUrl().c_str(), why.c_str());
    return Fail("too large: " + why);
}

int DMAParser::Parse(DMABrowse* browse) {
    Clear();
    error_.clear();
    if (browse == nullptr || !browse->IsPrepared())
        return Fail("browse not prepared");

    // libcurl is loaded here only, so that requests that never browse do not pay for it.
    const harmona::plugin::Plugin plugin =
        harmona::plugin::Plugin::OpenBesideProgram(harmona::dma::kHttpPluginFile);
    auto* post = plugin.Get<harmona_http_post_fn>(harmona::dma::kHttpPostSymbol);
    if (post == nullptr)
        return Fail("HTTP plugin unavailable: " + plugin.Error());

    // The whole browse, every page of it, gets one 20-second budget.
    const Clock::time_point deadline =
        Clock::now() + std::chrono::milliseconds(harmona::dma::kWholeReplyTimeoutMs);
    const char* const headers[] = {harmona::dma::kBrowseContentType,
                                   harmona::dma::kBrowseSoapAction};
    const bool fetchAll = browse->requestedCount == 0;
    unsigned long index = browse->startingIndex;
    std::size_t textBytes = 0;  // of the objects of every page so far
    for (bool firstPage = true;; firstPage = false) {
        const long remainingMs = static_cast<long>(
            std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()).count());
        if (remainingMs <= 0)
            return Fail("no whole reply within the time limit");
        const std::string envelope = harmona::dma::BuildBrowseEnvelope(
            browse->objectId, browse->BrowseFlag(), browse->filter, index, browse->requestedCount,
            browse->sortCriteria);
        ReplyBuffer reply;
        harmona_http_post_request request{};
        request.url = browse->ControlUrl().c_str();
        request.headers = headers;
        request.headerCount = sizeof(headers) / sizeof(headers[0]);
        request.body = envelope.data();
        request.bodySize = envelope.size();
        request.connectTimeoutMs = std::min(harmona::dma::kConnectTimeoutMs, remainingMs);
        request.totalTimeoutMs = remainingMs;
        request.sink = AppendToReply;
        request.sinkContext = &reply;
        request.expect = ExpectReplySize;
        harmona_http_post_result outcome{};
        if (post(&request, &outcome) != 0) {
            if (reply.tooLarge)
                return Refuse(
                    *browse,
                    "a reply over " + std::to_string(harmona::dma::kMaxReplyBytes >> 20) + " MiB");
            return Fail(outcome.error);
        }
        if (outcome.status != 200)
            return Fail("HTTP status " + std::to_string(outcome.status));

        harmona::dma::BrowsePage page;
        const harmona::dma::ReplyStatus status =
            harmona::dma::ParseBrowseResponse(reply.data, page);
        if (status == harmona::dma::ReplyStatus::fault)
            return Fail("SOAP fault");
        if (status != harmona::dma::ReplyStatus::ok)
            return Fail("not a BrowseResponse");
        totalMatches_ = page.totalMatches;
        if (firstPage)
            hasResult_ = page.hasResult;
        if (!page.hasResult)
            break;
        // The DIDL-Lite text usually lies inside the reply buffer (see BrowsePage), which lives
        // until this page is done.
        const std::size_t treeBytes =
            harmona::dma::EstimatedDidlTreeBytes(page.ResultData(), page.ResultSize());
        if (treeBytes > harmona::dma::kMaxDidlTreeBytes)
            return Refuse(*browse, "a page would take " + std::to_string(treeBytes >> 20) +
                                       " MiB to parse, more than " +
                                       std::to_string(harmona::dma::kMaxDidlTreeBytes >> 20));
        const long count = harmona::dma::ParseDidl(page.ResultData(), page.ResultSize(), items_,
                                                   harmona::dma::kMaxBrowseObjects);
        if (count == harmona::dma::kTooManyObjects)
            return Refuse(*browse, "more than " + std::to_string(harmona::dma::kMaxBrowseObjects) +
                                       " objects");
        if (count < 0)
            return Fail("Result is not DIDL-Lite");
        for (std::size_t i = items_.size() - static_cast<std::size_t>(count); i < items_.size();
             ++i)
            textBytes += items_[i]->TextBytes();
        if (textBytes > harmona::dma::kMaxBrowseTextBytes)
            return Refuse(*browse, "objects of more than " +
                                       std::to_string(harmona::dma::kMaxBrowseTextBytes >> 20) +
                                       " MiB of text");
        index += static_cast<unsigned long>(count);
        // Ask again from the next index while a page brought objects and some are still missing.
        if (!fetchAll || count == 0 || index >= page.totalMatches || index > UINT_MAX)
            break;
    }
    return 0;
}
