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

// What one browse keeps from page to page.
struct DMAParser::Paging {
    harmona_http_post_fn* post = nullptr;
    Clock::time_point deadline;  // one budget for every page of the browse
    unsigned long index = 0;     // the StartingIndex of the next page
    bool firstPage = true;
    std::size_t textBytes = 0;  // of the objects of every page so far
};

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

    Paging paging;
    paging.post = post;
    // The whole browse, every page of it, gets one 20-second budget.
    paging.deadline = Clock::now() + std::chrono::milliseconds(harmona::dma::kWholeReplyTimeoutMs);
    paging.index = browse->startingIndex;
    return FetchPages(*browse, paging);
}

int DMAParser::FetchPages(const DMABrowse& browse, Paging& paging) {
    for (;; paging.firstPage = false) {
        // The DIDL-Lite text of a page usually lies inside its reply (see BrowsePage), which lives
        // until the page is parsed.
        std::string reply;
        if (RequestPage(browse, paging, reply) != 0)
            return 1;
        bool morePages = false;
        if (ParsePage(browse, reply, paging, morePages) != 0)
            return 1;
        if (!morePages)
            return 0;
    }
}

int DMAParser::RequestPage(const DMABrowse& browse, const Paging& paging, std::string& reply) {
    const long remainingMs = static_cast<long>(
        std::chrono::duration_cast<std::chrono::milliseconds>(paging.deadline - Clock::now())
            .count());
    if (remainingMs <= 0)
        return Fail("no whole reply within the time limit");
    const std::string envelope =
        harmona::dma::BuildBrowseEnvelope(browse.objectId, browse.BrowseFlag(), browse.filter,
                                          paging.index, browse.requestedCount, browse.sortCriteria);
    const char* const headers[] = {harmona::dma::kBrowseContentType,
                                   harmona::dma::kBrowseSoapAction};
    ReplyBuffer buffer;
    harmona_http_post_request request{};
    request.url = browse.ControlUrl().c_str();
    request.headers = headers;
    request.headerCount = sizeof(headers) / sizeof(headers[0]);
    request.body = envelope.data();
    request.bodySize = envelope.size();
    request.connectTimeoutMs = std::min(harmona::dma::kConnectTimeoutMs, remainingMs);
    request.totalTimeoutMs = remainingMs;
    request.sink = AppendToReply;
    request.sinkContext = &buffer;
    request.expect = ExpectReplySize;
    harmona_http_post_result outcome{};
    if (paging.post(&request, &outcome) != 0) {
        if (buffer.tooLarge)
            return Refuse(browse, "a reply over " +
                                      std::to_string(harmona::dma::kMaxReplyBytes >> 20) + " MiB");
        return Fail(outcome.error);
    }
    if (outcome.status != 200)
        return Fail("HTTP status " + std::to_string(outcome.status));
    reply = std::move(buffer.data);
    return 0;
}

int DMAParser::ParsePage(const DMABrowse& browse, std::string& reply, Paging& paging,
                         bool& morePages) {
    morePages = false;
    harmona::dma::BrowsePage page;
    const harmona::dma::ReplyStatus status = harmona::dma::ParseBrowseResponse(reply, page);
    if (status == harmona::dma::ReplyStatus::fault)
        return Fail("SOAP fault");
    if (status != harmona::dma::ReplyStatus::ok)
        return Fail("not a BrowseResponse");
    totalMatches_ = page.totalMatches;
    if (paging.firstPage)
        hasResult_ = page.hasResult;
    if (!page.hasResult)
        return 0;
    const std::size_t treeBytes =
        harmona::dma::EstimatedDidlTreeBytes(page.ResultData(), page.ResultSize());
    if (treeBytes > harmona::dma::kMaxDidlTreeBytes)
        return Refuse(browse, "a page would take " + std::to_string(treeBytes >> 20) +
                                  " MiB to parse, more than " +
                                  std::to_string(harmona::dma::kMaxDidlTreeBytes >> 20));
    const long count = harmona::dma::ParseDidl(page.ResultData(), page.ResultSize(), items_,
                                               harmona::dma::kMaxBrowseObjects);
    if (count == harmona::dma::kTooManyObjects)
        return Refuse(browse,
                      "more than " + std::to_string(harmona::dma::kMaxBrowseObjects) + " objects");
    if (count < 0)
        return Fail("Result is not DIDL-Lite");
    for (std::size_t i = items_.size() - static_cast<std::size_t>(count); i < items_.size(); ++i)
        paging.textBytes += items_[i]->TextBytes();
    if (paging.textBytes > harmona::dma::kMaxBrowseTextBytes)
        return Refuse(browse, "objects of more than " +
                                  std::to_string(harmona::dma::kMaxBrowseTextBytes >> 20) +
                                  " MiB of text");
    paging.index += static_cast<unsigned long>(count);
    // Ask again from the next index while a page brought objects and some are still missing.
    morePages = browse.requestedCount == 0 && count != 0 && paging.index < page.totalMatches &&
                paging.index <= UINT_MAX;
    return 0;
}
