#!/usr/bin/env python3
"""Prints the id of the container reached from the root by the given titles, browsing a
ContentDirectory control URL (for servers whose ids are not fixed, such as Gerbera's)."""
import re
import sys
import urllib.request
from xml.sax.saxutils import escape
import xml.etree.ElementTree as ET

DIDL = "{urn:schemas-upnp-org:metadata-1-0/DIDL-Lite/}"
DC = "{http://purl.org/dc/elements/1.1/}"


def children(url, object_id):
    body = ('<?xml version="1.0"?><s:Envelope xmlns:s="http://schemas.xmlsoap.org/soap/envelope/" '
            's:encodingStyle="http://schemas.xmlsoap.org/soap/encoding/"><s:Body><u:Browse '
            'xmlns:u="urn:schemas-upnp-org:service:ContentDirectory:1"><ObjectID>%s</ObjectID>'
            '<BrowseFlag>BrowseDirectChildren</BrowseFlag><Filter>*</Filter><StartingIndex>0'
            '</StartingIndex><RequestedCount>200</RequestedCount><SortCriteria></SortCriteria>'
            '</u:Browse></s:Body></s:Envelope>' % escape(object_id))
    request = urllib.request.Request(url, body.encode(), {
        "Content-Type": 'text/xml; charset="utf-8"',
        "SOAPACTION": '"urn:schemas-upnp-org:service:ContentDirectory:1#Browse"'})
    reply = urllib.request.urlopen(request, timeout=30).read().decode("utf-8", "replace")
    result = re.search(r"<Result>(.*)</Result>", reply, re.S)
    if not result:
        return []
    didl = ET.fromstring(result.group(1).replace("&lt;", "<").replace("&gt;", ">")
                         .replace("&quot;", '"').replace("&amp;", "&"))
    return [(c.get("id"), c.findtext(DC + "title")) for c in didl.findall(DIDL + "container")]


def main():
    url, titles = sys.argv[1], sys.argv[2:]
    current = "0"
    for title in titles:
        found = [cid for cid, ctitle in children(url, current) if ctitle == title]
        if not found:
            print("")
            return 1
        current = found[0]
    print(current)
    return 0


if __name__ == "__main__":
    sys.exit(main())
