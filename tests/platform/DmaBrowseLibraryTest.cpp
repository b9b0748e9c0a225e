// The browse library beneath the music library subtree (platform/README.md, "Local media server
// and browse library"): the SOAP envelope, its escaping, the parsing of SOAP replies and
// DIDL-Lite, and DMAParser against a scripted server.
#include <gtest/gtest.h>

#include <pugixml.hpp>

#include "platform/dma/DMABrowse.h"
#include "platform/dma/DMAParser.h"
#include "platform/dma/SoapBrowse.h"
#include "tests/harness/ScriptedHttpServer.h"

using namespace harmona::test;
using namespace harmona::dma;

namespace {

constexpr const char* kControlUrl = "http://127.0.0.1:50003/ContentDirectory/control";

// A BrowseDirectChildren of `objectId` at the scripted server, prepared (`prepareResult`), and the
// parser that runs it.
struct ChildrenBrowse {
    explicit ChildrenBrowse(const char* objectId, unsigned startingIndex = 0,
                            unsigned requestedCount = 0)
        : browse(BrowseDirectChildren, kControlUrl) {
        browse.objectId = objectId;
        browse.startingIndex = startingIndex;
        browse.requestedCount = requestedCount;
        prepareResult = browse.Prepare();
    }
    int Run() { return parser.Parse(&browse); }

    DMABrowse browse;
    int prepareResult = -1;
    DMAParser parser;
};

// Starts `server` serving a container "c" of 120 items "t0" to "t119" in pages of at most 50.
bool ServeContainerOf120Items(ScriptedHttpServer& server) {
    ContentTree tree;
    tree.AddManyItems("c", 120, "t");
    server.ServeTree(tree, 50);
    return server.Start();
}

std::string Unescaped(const std::string& element, const std::string& envelope) {
    pugi::xml_document doc;
    EXPECT_TRUE(doc.load_string(envelope.c_str()));
    return doc.find_node([&](pugi::xml_node n) { return element == n.name(); }).text().get();
}

TEST(DmaBrowseLibrary, EnvelopeIsSoap11BrowseWithEveryArgumentEscaped) {
    const std::string id = "64$&<x>\"'\xC3\xA9\r\n";
    const std::string envelope =
        BuildBrowseEnvelope(id, "BrowseDirectChildren", "dc:title,<res>", 7, 50, "+dc:title&");
    pugi::xml_document doc;
    ASSERT_TRUE(doc.load_string(envelope.c_str()));
    const pugi::xml_node root = doc.document_element();
    EXPECT_STREQ(root.name(), "s:Envelope");
    EXPECT_STREQ(root.attribute("xmlns:s").value(), "http://schemas.xmlsoap.org/soap/envelope/");
    const pugi::xml_node browse = root.child("s:Body").child("u:Browse");
    ASSERT_TRUE(browse);
    EXPECT_STREQ(browse.attribute("xmlns:u").value(),
                 "urn:schemas-upnp-org:service:ContentDirectory:1");
    EXPECT_EQ(std::string(browse.child("ObjectID").text().get()), id);
    EXPECT_STREQ(browse.child("BrowseFlag").text().get(), "BrowseDirectChildren");
    EXPECT_STREQ(browse.child("Filter").text().get(), "dc:title,<res>");
    EXPECT_STREQ(browse.child("StartingIndex").text().get(), "7");
    EXPECT_STREQ(browse.child("RequestedCount").text().get(), "50");
    EXPECT_STREQ(browse.child("SortCriteria").text().get(), "+dc:title&");
    // The arguments come in the order of the action's declaration.
    std::vector<std::string> order;
    for (pugi::xml_node child : browse.children())
        order.push_back(child.name());
    EXPECT_EQ(order, (std::vector<std::string>{"ObjectID", "BrowseFlag", "Filter", "StartingIndex",
                                               "RequestedCount", "SortCriteria"}));
}

TEST(DmaBrowseLibrary, PrepareRefusesEmptyObjectIdAndNonHttpUrls) {
    for (const char* url : {"", "https://127.0.0.1/x", "127.0.0.1:50003/x", "http://", "http:///x",
                            "ftp://h/x", "http://h /x", "http://user@h/x"}) {
        DMABrowse browse(BrowseDirectChildren, url);
        browse.objectId = "0";
        EXPECT_NE(browse.Prepare(), 0) << url;
        EXPECT_FALSE(browse.IsPrepared()) << url;
    }
    DMABrowse empty(BrowseDirectChildren, kControlUrl);
    EXPECT_NE(empty.Prepare(), 0);
    // What a prepared browse sends, as the server receives it.
    ScriptedHttpServer server;
    server.SetResponder([](const RecordedRequest&) { return Reply(BrowseResponseBody("", 0, 0)); });
    ASSERT_TRUE(server.Start());
    DMABrowse good(BrowseDirectChildren, kControlUrl);
    good.objectId = "music_album";
    EXPECT_EQ(good.Prepare(), 0);
    DMAParser goodParser;
    EXPECT_EQ(goodParser.Parse(&good), 0) << goodParser.Error();
    DMABrowse meta(BrowseMetadata, "HTTP://127.0.0.1:50003/ContentDirectory/control");
    meta.objectId = "0";
    EXPECT_EQ(meta.Prepare(), 0);
    DMAParser metaParser;
    EXPECT_EQ(metaParser.Parse(&meta), 0) << metaParser.Error();
    const std::vector<RecordedRequest> requests = server.Requests();
    ASSERT_EQ(requests.size(), 2u);
    EXPECT_EQ(Unescaped("ObjectID", requests[0].body), "music_album");
    EXPECT_EQ(Unescaped("BrowseFlag", requests[0].body), "BrowseDirectChildren");
    EXPECT_EQ(Unescaped("BrowseFlag", requests[1].body), "BrowseMetadata");
}

TEST(DmaBrowseLibrary, OnlyNumericAddressesOfOtherMachinesAreNetworkHosts) {
    for (const char* url :
         {"http://192.168.1.20:8200/ctl", "http://10.0.0.1/ctl", "HTTP://172.16.5.4:49152",
          "http://[2001:db8::7]:8200/ctl", "http://[fd00::1]/c", "http://198.51.100.2:50004/ctl?x"})
        EXPECT_TRUE(IsNetworkHostUrl(url)) << url;
    for (const char* url :
         {"http://127.0.0.1:50003/ctl", "http://127.8.9.10/ctl", "http://0.0.0.0:80/",
          "http://169.254.1.1/ctl", "http://[::1]/ctl", "http://[::]/ctl", "http://[fe80::1]/ctl",
          "http://[::ffff:127.0.0.1]/ctl", "http://[::ffff:169.254.0.9]/ctl", "http://localhost/c",
          "http://mediaserver.lan/ctl", "http://127.1/ctl", "http://2130706433/ctl",
          "http://0x7f.0.0.1/ctl", "http://[::1/ctl", "https://192.168.1.20/ctl",
          "http://user@192.168.1.20/ctl", "http://:80/ctl", ""})
        EXPECT_FALSE(IsNetworkHostUrl(url)) << url;
}

TEST(DmaBrowseLibrary, DefaultsOfTheBrowseObject) {
    DMABrowse browse(BrowseDirectChildren, kControlUrl);
    EXPECT_EQ(browse.filter, "*");
    EXPECT_EQ(browse.startingIndex, 0u);
    EXPECT_EQ(browse.requestedCount, 0u);
    EXPECT_EQ(browse.sortCriteria, "");
    EXPECT_EQ(browse.objectId, "");
    EXPECT_EQ(browse.ControlUrl(), kControlUrl);
}

TEST(DmaBrowseLibrary, DidlParsedByNamespaceWhateverThePrefixes) {
    // Unusual prefixes, a default namespace on an item, a second res, comments and whitespace.
    std::string didl =
        "<?xml version=\"1.0\"?><d:DIDL-Lite "
        "xmlns:d=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\" "
        "xmlns:t=\"http://purl.org/dc/elements/1.1/\" "
        "xmlns:u=\"urn:schemas-upnp-org:metadata-1-0/upnp/\">"
        "<!-- note --><d:container id=\"c1\" parentID=\"0\" childCount=\"3\"><t:title>Albums &amp; "
        "more</t:title>"
        "<u:class>object.container</u:class></d:container>\n"
        "<item xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\" id=\"i&lt;2&gt;\" "
        "parentID=\"c1\">"
        "<title xmlns=\"http://purl.org/dc/elements/1.1/\">Song ✓</title>"
        "<x:title xmlns:x=\"urn:other\">wrong title</x:title>"
        "<u:artist>Artist</u:artist><u:album>Album</u:album><t:creator>Creator</t:creator>"
        "<res protocolInfo=\"http-get:*:audio/mpeg:*\"> http://h/1.mp3 "
        "</res><res>http://h/2.mp3</res>"
        "</item><d:desc id=\"x\">ignored</d:desc><other:item xmlns:other=\"urn:not-didl\" "
        "id=\"no\"/>"
        "</d:DIDL-Lite>";
    std::vector<ItemNode*> items;
    ASSERT_EQ(ParseDidl(didl, items), 2);
    EXPECT_TRUE(items[0]->isContainer);
    EXPECT_EQ(items[0]->getValueByKey("id"), "c1");
    EXPECT_EQ(items[0]->getValueByKey("parentID"), "0");
    EXPECT_EQ(items[0]->getValueByKey("title"), "Albums & more");
    EXPECT_EQ(items[0]->getValueByKey("class"), "object.container");
    EXPECT_EQ(items[0]->getValueByKey("childCount"), "3");
    EXPECT_EQ(items[0]->getValueByKey("res"), "");
    EXPECT_FALSE(items[1]->isContainer);
    EXPECT_EQ(items[1]->getValueByKey("id"), "i<2>");
    EXPECT_EQ(items[1]->getValueByKey("title"), "Song ✓");
    EXPECT_EQ(items[1]->getValueByKey("artist"), "Artist");
    EXPECT_EQ(items[1]->getValueByKey("album"), "Album");
    EXPECT_EQ(items[1]->getValueByKey("res"), "http://h/1.mp3");
    EXPECT_EQ(items[1]->getValueByKey("childCount"), "");
    EXPECT_EQ(items[1]->getValueByKey("unknown"), "");
    EXPECT_EQ(items[1]->getValueByKey(""), "");
    for (ItemNode* item : items)
        delete item;
}

TEST(DmaBrowseLibrary, DidlOfAnotherNamespaceOrBrokenIsRefused) {
    std::vector<ItemNode*> items;
    std::string wrongNs = "<DIDL-Lite xmlns=\"urn:other\"><item id=\"1\"/></DIDL-Lite>";
    EXPECT_EQ(ParseDidl(wrongNs, items), -1);
    std::string broken = "<DIDL-Lite xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\"><item>";
    EXPECT_EQ(ParseDidl(broken, items), -1);
    EXPECT_TRUE(items.empty());
}

TEST(DmaBrowseLibrary, EntitiesOfADtdAreNeverExpanded) {
    std::string bomb =
        "<?xml version=\"1.0\"?><!DOCTYPE DIDL-Lite [<!ENTITY a \"aaaaaaaaaa\">"
        "<!ENTITY b \"&a;&a;&a;&a;&a;&a;&a;&a;&a;&a;\"><!ENTITY ext SYSTEM "
        "\"file:///etc/passwd\">]>"
        "<DIDL-Lite xmlns=\"urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/\" "
        "xmlns:dc=\"http://purl.org/dc/elements/1.1/\"><item id=\"1\"><dc:title>&b;&ext;</dc:title>"
        "</item></DIDL-Lite>";
    std::vector<ItemNode*> items;
    ASSERT_EQ(ParseDidl(bomb, items), 1);
    EXPECT_EQ(items[0]->getValueByKey("title").find("aaaa"), std::string::npos);
    EXPECT_EQ(items[0]->getValueByKey("title").find("root:"), std::string::npos);
    delete items[0];
}

TEST(DmaBrowseLibrary, SoapReplyParsingFaultsAndMissingResult) {
    std::string ok = BrowseResponseBody(DidlLite({}), 0, 0);
    BrowsePage page;
    EXPECT_EQ(ParseBrowseResponse(ok, page), ReplyStatus::ok);
    EXPECT_TRUE(page.hasResult);
    std::string none = BrowseResponseBody("", 0, 0, false);
    EXPECT_EQ(ParseBrowseResponse(none, page), ReplyStatus::ok);
    EXPECT_FALSE(page.hasResult);
    std::string empty = BrowseResponseBody("", 0, 0, true);
    EXPECT_EQ(ParseBrowseResponse(empty, page), ReplyStatus::ok);
    EXPECT_FALSE(page.hasResult);
    std::string fault = SoapFaultBody(701, "No such object");
    EXPECT_EQ(ParseBrowseResponse(fault, page), ReplyStatus::fault);
    std::string garbage =
        "<s:Envelope xmlns:s=\"http://schemas.xmlsoap.org/soap/envelope/\"><s:Body>";
    EXPECT_EQ(ParseBrowseResponse(garbage, page), ReplyStatus::malformed);
    std::string wrongEnvelope = "<Envelope><Body><BrowseResponse/></Body></Envelope>";
    EXPECT_EQ(ParseBrowseResponse(wrongEnvelope, page), ReplyStatus::malformed);
    std::string otherAction =
        "<E:Envelope xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\"><E:Body>"
        "<m:SearchResponse "
        "xmlns:m=\"urn:schemas-upnp-org:service:ContentDirectory:1\"/></E:Body></E:Envelope>";
    EXPECT_EQ(ParseBrowseResponse(otherAction, page), ReplyStatus::notBrowseResponse);
    // Other prefixes, a CDATA Result, TotalMatches read.
    std::string cdata =
        "<E:Envelope xmlns:E=\"http://schemas.xmlsoap.org/soap/envelope/\"><E:Body>"
        "<m:BrowseResponse "
        "xmlns:m=\"urn:schemas-upnp-org:service:ContentDirectory:1\"><Result><![CDATA[" +
        DidlLite({{true, "7", "0", "Seven"}}) +
        "]]></Result><NumberReturned>1</NumberReturned><TotalMatches>9</TotalMatches></"
        "m:BrowseResponse>"
        "</E:Body></E:Envelope>";
    ASSERT_EQ(ParseBrowseResponse(cdata, page), ReplyStatus::ok);
    EXPECT_TRUE(page.hasResult);
    EXPECT_EQ(page.totalMatches, 9u);
    std::vector<ItemNode*> items;
    std::string didl = page.ResultText();
    ASSERT_EQ(ParseDidl(didl, items), 1);
    EXPECT_EQ(items[0]->getValueByKey("title"), "Seven");
    delete items[0];
}

TEST(DmaBrowseLibrary, ParserSendsTheExactSoapRequest) {
    ScriptedHttpServer server;
    server.Enqueue(Reply(BrowseResponseBody(DidlLite({{true, "a", "x", "A"}}), 1, 1)));
    ASSERT_TRUE(server.Start());
    ChildrenBrowse children("x");
    ASSERT_EQ(children.prepareResult, 0);
    ASSERT_EQ(children.Run(), 0) << children.parser.Error();
    ASSERT_NE(children.parser.GetResult(), nullptr);
    ASSERT_EQ(children.parser.GetResult()->size(), 1u);
    const std::vector<RecordedRequest> requests = server.Requests();
    ASSERT_EQ(requests.size(), 1u);
    const RecordedRequest& r = requests[0];
    EXPECT_EQ(r.method, "POST");
    EXPECT_EQ(r.target, "/ContentDirectory/control");
    EXPECT_EQ(r.Header("SOAPACTION"), "\"urn:schemas-upnp-org:service:ContentDirectory:1#Browse\"");
    EXPECT_EQ(r.Header("Content-Type"), "text/xml; charset=\"utf-8\"");
    EXPECT_EQ(r.Header("Expect"), "");
    EXPECT_EQ(r.body, BuildBrowseEnvelope("x", "BrowseDirectChildren", "*", 0, 0, ""));
    EXPECT_TRUE(r.isBrowse);
    EXPECT_EQ(r.objectId, "x");
    EXPECT_EQ(r.browseFlag, "BrowseDirectChildren");
    EXPECT_EQ(r.filter, "*");
    EXPECT_EQ(r.startingIndex, 0);
    EXPECT_EQ(r.requestedCount, 0);
    EXPECT_EQ(r.sortCriteria, "");
}

TEST(DmaBrowseLibrary, ParserRefusesAnUnpreparedBrowse) {
    DMABrowse browse(BrowseDirectChildren, kControlUrl);
    browse.objectId = "x";
    DMAParser parser;
    EXPECT_NE(parser.Parse(&browse), 0);
    EXPECT_NE(parser.Parse(nullptr), 0);
    EXPECT_EQ(parser.GetResult(), nullptr);
}

TEST(DmaBrowseLibrary, ExplicitRequestedCountAsksOnePageOnly) {
    ScriptedHttpServer server;
    ASSERT_TRUE(ServeContainerOf120Items(server));
    ChildrenBrowse children("c", 10, 30);
    ASSERT_EQ(children.prepareResult, 0);
    ASSERT_EQ(children.Run(), 0);
    ASSERT_EQ(children.parser.GetResult()->size(), 30u);
    EXPECT_EQ(children.parser.GetResult()->front()->getValueByKey("id"), "t10");
    ASSERT_EQ(server.Requests().size(), 1u);
    EXPECT_EQ(server.Requests()[0].startingIndex, 10);
    EXPECT_EQ(server.Requests()[0].requestedCount, 30);
}

TEST(DmaBrowseLibrary, PagingFromAStartingIndexStopsAtTotalMatches) {
    ScriptedHttpServer server;
    ASSERT_TRUE(ServeContainerOf120Items(server));
    ChildrenBrowse children("c", 30);
    ASSERT_EQ(children.prepareResult, 0);
    ASSERT_EQ(children.Run(), 0);
    ASSERT_EQ(children.parser.GetResult()->size(), 90u);
    EXPECT_EQ(children.parser.GetResult()->back()->getValueByKey("id"), "t119");
    const std::vector<RecordedRequest> requests = server.Requests();
    ASSERT_EQ(requests.size(), 2u);
    EXPECT_EQ(requests[1].startingIndex, 80);
    EXPECT_EQ(children.parser.TotalMatches(), 120u);
}

TEST(DmaBrowseLibrary, PagingStopsOnAnEmptyPageEvenIfTotalMatchesLies) {
    ScriptedHttpServer server;
    server.Enqueue(Reply(BrowseResponseBody(DidlLite({{true, "a", "c", "A"}}), 1, 1000)));
    server.Enqueue(Reply(BrowseResponseBody(DidlLite({}), 0, 1000)));
    ASSERT_TRUE(server.Start());
    ChildrenBrowse children("c");
    ASSERT_EQ(children.prepareResult, 0);
    ASSERT_EQ(children.Run(), 0);
    EXPECT_EQ(children.parser.GetResult()->size(), 1u);
    EXPECT_EQ(server.Requests().size(), 2u);
}

TEST(DmaBrowseLibrary, NonOkStatusesFail) {
    for (int status : {201, 204, 301, 404, 500}) {
        ScriptedHttpServer server;
        ScriptedReply reply =
            Reply(BrowseResponseBody(DidlLite({{true, "a", "c", "A"}}), 1, 1), status);
        server.Enqueue(reply);
        ASSERT_TRUE(server.Start());
        ChildrenBrowse children("c");
        ASSERT_EQ(children.prepareResult, 0);
        EXPECT_NE(children.Run(), 0) << status;
        EXPECT_EQ(children.parser.GetResult(), nullptr);
    }
}

}  // namespace
