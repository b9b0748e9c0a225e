#!/usr/bin/python3
"""A GUPnP-AV control point against harmona-mediad, as a player on the network uses it.

Discovers the server over SSDP on one interface, browses every container with both browse flags,
pages through each listing with StartingIndex and RequestedCount, parses every DIDL-Lite document
with GUPnP-AV's parser, fetches a resource with a Range request, subscribes to ContentDirectory's
events and, after a file is added to the share and the indexer has run, waits for the NOTIFY that
carries the new SystemUpdateID. Prints one line per finding; exit status 0 when everything held,
1 with the reason otherwise. Every wait has a time limit.
"""
import argparse
import os
import shutil
import subprocess
import sys
import time
import urllib.request

import gi

gi.require_version("GLib", "2.0")
gi.require_version("GSSDP", "1.6")
gi.require_version("GUPnP", "1.6")
gi.require_version("GUPnPAV", "1.0")
from gi.repository import GLib, GObject, GSSDP, GUPnP, GUPnPAV  # noqa: E402

MEDIA_SERVER = "urn:schemas-upnp-org:device:MediaServer:1"
CONTENT_DIRECTORY = "urn:schemas-upnp-org:service:ContentDirectory:1"
PAGE = 2
MAX_CONTAINERS = 500


class Failure(Exception):
    pass


def check(condition, message):
    if not condition:
        raise Failure(message)


def run_loop_until(predicate, seconds):
    """Runs the default main loop until predicate() holds or the time is up."""
    loop = GLib.MainLoop()

    def poll():
        if predicate():
            loop.quit()
            return False
        return True

    sources = [GLib.timeout_add(20, poll),
               GLib.timeout_add(int(seconds * 1000), lambda: loop.quit() or False)]
    if not predicate():
        loop.run()
    for source in sources:
        if GLib.MainContext.default().find_source_by_id(source):
            GLib.source_remove(source)
    return predicate()


def discover(interface):
    context = GUPnP.Context.new_full(interface, None, 0, GSSDP.UDAVersion.VERSION_1_0)
    control_point = GUPnP.ControlPoint.new(context, MEDIA_SERVER)
    found = []

    def on_device(_cp, proxy):
        if proxy.get_model_name() == "harmona-mediad":
            found.append(proxy)

    control_point.connect("device-proxy-available", on_device)
    control_point.set_active(True)
    check(run_loop_until(lambda: found, 15), "no harmona-mediad found on " + interface)
    return context, control_point, found[0]


class Browser:
    def __init__(self, service):
        self.service = service
        self.documents = 0

    def browse(self, object_id, flag, start=0, count=0):
        action = GUPnP.ServiceProxyAction.new_from_list(
            "Browse",
            ["ObjectID", "BrowseFlag", "Filter", "StartingIndex", "RequestedCount", "SortCriteria"],
            [object_id, flag, "*", str(start), str(count), ""])
        self.service.call_action(action, None)
        ok, values = action.get_result_list(
            ["Result", "NumberReturned", "TotalMatches", "UpdateID"],
            [GObject.TYPE_STRING, GObject.TYPE_UINT, GObject.TYPE_UINT, GObject.TYPE_UINT])
        check(ok, "Browse %s %s failed" % (object_id, flag))
        didl, returned, total, _update = values
        objects = self.parse(didl, object_id)
        check(len(objects) == returned,
              "%s: NumberReturned %d but %d objects" % (object_id, returned, len(objects)))
        return objects, total

    def parse(self, didl, where):
        parser = GUPnPAV.DIDLLiteParser()
        objects = []
        parser.connect("object-available", lambda _p, o: objects.append(o))
        try:
            parser.parse_didl(didl)
        except GLib.Error as error:
            raise Failure("DIDL-Lite of %s does not parse: %s" % (where, error.message))
        self.documents += 1
        return objects


def walk(browser):
    """Every container from the root: metadata, whole listing and the same listing in pages, which
    must hold the same objects in the same order ("random" included: its draw holds until the
    library changes). Every child names the container it is listed under as its parent, and
    says so again in its own BrowseMetadata."""
    queue, seen, items = ["0"], set(), []
    while queue and len(seen) < MAX_CONTAINERS:
        container = queue.pop(0)
        if container in seen:
            continue
        seen.add(container)
        meta, total_meta = browser.browse(container, "BrowseMetadata")
        check(len(meta) == 1 and total_meta == 1, "BrowseMetadata of %s: %d objects" % (container, len(meta)))
        check(meta[0].get_id() == container, "BrowseMetadata of %s names %s" % (container, meta[0].get_id()))
        whole, total = browser.browse(container, "BrowseDirectChildren")
        check(len(whole) == total, "%s: TotalMatches %d, %d listed" % (container, total, len(whole)))
        paged = []
        start = 0
        while start < total:
            page, page_total = browser.browse(container, "BrowseDirectChildren", start, PAGE)
            check(page_total == total, "%s: TotalMatches moved while paging" % container)
            check(len(page) > 0, "%s: empty page at %d of %d" % (container, start, total))
            paged += page
            start += len(page)
        whole_ids = [o.get_id() for o in whole]
        paged_ids = [o.get_id() for o in paged]
        check(len(paged_ids) == len(whole_ids), "%s: pages hold %d objects, the listing %d"
              % (container, len(paged_ids), len(whole_ids)))
        check(paged_ids == whole_ids, "%s: pages hold other objects or another order than the whole listing" % container)
        for child in whole:
            check(child.get_parent_id() == container,
                  "%s listed under %s names parent %s" % (child.get_id(), container, child.get_parent_id()))
            if isinstance(child, GUPnPAV.DIDLLiteContainer):
                queue.append(child.get_id())
            else:
                own, _ = browser.browse(child.get_id(), "BrowseMetadata")
                check(len(own) == 1 and own[0].get_parent_id() == container,
                      "BrowseMetadata of %s does not name %s as its parent" % (child.get_id(), container))
                items.append(child)
    return seen, items


def fetch_range(items):
    for item in items:
        for resource in item.get_resources():
            uri = resource.get_uri()
            if not uri:
                continue
            request = urllib.request.Request(uri, headers={"Range": "bytes=0-99"})
            with urllib.request.urlopen(request, timeout=10) as reply:
                body = reply.read()
                check(reply.status == 206, "Range GET of %s answered %d" % (uri, reply.status))
                check(len(body) == 100, "Range GET of %s gave %d bytes" % (uri, len(body)))
                check(reply.headers.get("contentFeatures.dlna.org"), "no contentFeatures.dlna.org on " + uri)
                return uri
    raise Failure("no item carries a resource URL")


def system_update_id(service):
    action = GUPnP.ServiceProxyAction.new_from_list("GetSystemUpdateID", [], [])
    service.call_action(action, None)
    ok, values = action.get_result_list(["Id"], [GObject.TYPE_UINT])
    check(ok, "GetSystemUpdateID failed")
    return values[0]


def event_after_new_file(service, indexer, source, target):
    values, lost = [], []
    service.connect("subscription-lost", lambda _s, error: lost.append(error.message))
    service.add_notify("SystemUpdateID", GObject.TYPE_UINT, lambda _s, _v, value: values.append(value))
    service.set_subscribed(True)
    # GUPnP's proxy may drop the initial event when it races the SUBSCRIBE answer; the test is
    # about the event that follows a change, so the starting value comes from the action.
    run_loop_until(lambda: lost, 2)
    check(not lost and service.get_subscribed(), "subscription lost: %s" % "; ".join(lost))
    first = system_update_id(service)
    time.sleep(1.1)  # a new modification second for the library
    os.makedirs(os.path.dirname(target), exist_ok=True)
    shutil.copyfile(source, target)
    if indexer:
        subprocess.run([indexer], check=True, timeout=60, stdout=subprocess.DEVNULL)
    check(run_loop_until(lambda: values and values[-1] != first, 20),
          "no NOTIFY with a new SystemUpdateID after a file was added (still %d; %s)"
          % (first, "; ".join(lost)))
    return first, values[-1]


def main():
    options = argparse.ArgumentParser(description=__doc__)
    options.add_argument("--interface", default="lo")
    options.add_argument("--indexer", default="")
    options.add_argument("--add", nargs=2, metavar=("SOURCE", "TARGET"), required=True)
    args = options.parse_args()
    try:
        _context, _cp, device = discover(args.interface)
        print("found %s at %s" % (device.get_friendly_name(), device.get_location()))
        service = device.get_service(CONTENT_DIRECTORY)
        check(service is not None, "the device has no ContentDirectory")
        browser = Browser(service)
        containers, items = walk(browser)
        print("browsed %d containers, %d items, %d DIDL-Lite documents parsed"
              % (len(containers), len(items), browser.documents))
        print("range fetched from %s" % fetch_range(items))
        before, after = event_after_new_file(service, args.indexer, *args.add)
        print("SystemUpdateID event %d -> %d" % (before, after))
    except Failure as failure:
        print("FAILED: %s" % failure)
        return 1
    return 0


if __name__ == "__main__":
    sys.exit(main())
