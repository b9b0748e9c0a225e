#!/usr/bin/env node
// Draws the tree's icons, buttons and thumbnails as small real PNG files (and the blank s.gif),
// at the paths the CGI's tree nodes name under 3rdparty/Harmona/images/. Run from the repository root:
//   node web/tools/make-images.mjs
// The output is committed (web/site/3rdparty/Harmona/images/); rerun after changing a drawing.
// Each image is a list of layers, a colour and a shape over the unit square, rendered with 4x4
// supersampling, so the files are deterministic and need nothing beyond Node's zlib.
import { writeFileSync, mkdirSync } from "node:fs";
import { dirname, join } from "node:path";
import { deflateSync } from "node:zlib";

const root = "web/site/3rdparty/Harmona/images";

// --- shapes: predicates over (x, y) in [0, 1]^2, y downwards -------------------------------------
const circle = (cx, cy, r) => (x, y) => (x - cx) ** 2 + (y - cy) ** 2 <= r * r;
const ring = (cx, cy, r0, r1) => (x, y) => {
  const d = (x - cx) ** 2 + (y - cy) ** 2;
  return d <= r1 * r1 && d >= r0 * r0;
};
const rect = (x0, y0, x1, y1) => (x, y) => x >= x0 && x <= x1 && y >= y0 && y <= y1;
const roundRect = (x0, y0, x1, y1, r) => (x, y) => {
  if (!rect(x0, y0, x1, y1)(x, y)) return false;
  const cx = Math.min(Math.max(x, x0 + r), x1 - r);
  const cy = Math.min(Math.max(y, y0 + r), y1 - r);
  return (x - cx) ** 2 + (y - cy) ** 2 <= r * r;
};
const triangle = (ax, ay, bx, by, cx, cy) => (x, y) => {
  const s = (px, py, qx, qy) => (x - qx) * (py - qy) - (px - qx) * (y - qy);
  const d1 = s(ax, ay, bx, by), d2 = s(bx, by, cx, cy), d3 = s(cx, cy, ax, ay);
  const neg = d1 < 0 || d2 < 0 || d3 < 0, pos = d1 > 0 || d2 > 0 || d3 > 0;
  return !(neg && pos);
};
const union = (...shapes) => (x, y) => shapes.some((s) => s(x, y));
const minus = (a, b) => (x, y) => a(x, y) && !b(x, y);
const arc = (cx, cy, r0, r1, fromDeg, toDeg) => (x, y) => {
  if (!ring(cx, cy, r0, r1)(x, y)) return false;
  let a = (Math.atan2(y - cy, x - cx) * 180) / Math.PI;
  if (a < 0) a += 360;
  return fromDeg <= toDeg ? a >= fromDeg && a <= toDeg : a >= fromDeg || a <= toDeg;
};
const thickLine = (ax, ay, bx, by, w) => (x, y) => {
  const dx = bx - ax, dy = by - ay;
  const t = Math.max(0, Math.min(1, ((x - ax) * dx + (y - ay) * dy) / (dx * dx + dy * dy)));
  return (x - ax - t * dx) ** 2 + (y - ay - t * dy) ** 2 <= (w / 2) ** 2;
};

// --- drawings -------------------------------------------------------------------------------------
const note = union(circle(0.34, 0.74, 0.16), rect(0.44, 0.14, 0.52, 0.74), triangle(0.52, 0.14, 0.82, 0.3, 0.52, 0.42));
const folder = union(roundRect(0.08, 0.22, 0.46, 0.4, 0.05), roundRect(0.08, 0.3, 0.92, 0.84, 0.06));
const disc = minus(circle(0.5, 0.5, 0.42), circle(0.5, 0.5, 0.1));
const person = union(circle(0.5, 0.32, 0.18), minus(circle(0.5, 0.98, 0.4), rect(0, 0.92, 1, 1)));
const bars = union(rect(0.14, 0.5, 0.3, 0.88), rect(0.42, 0.2, 0.58, 0.88), rect(0.7, 0.38, 0.86, 0.88));
const die = roundRect(0.1, 0.1, 0.9, 0.9, 0.16);
const dieDots = union(circle(0.3, 0.3, 0.08), circle(0.5, 0.5, 0.08), circle(0.7, 0.7, 0.08), circle(0.7, 0.3, 0.08), circle(0.3, 0.7, 0.08));
const listLines = union(rect(0.1, 0.18, 0.62, 0.28), rect(0.1, 0.42, 0.62, 0.52), rect(0.1, 0.66, 0.5, 0.76));
const server = union(roundRect(0.14, 0.08, 0.86, 0.44, 0.06), roundRect(0.14, 0.54, 0.86, 0.9, 0.06));
const serverLights = union(circle(0.72, 0.26, 0.06), circle(0.72, 0.72, 0.06), rect(0.24, 0.22, 0.5, 0.3), rect(0.24, 0.68, 0.5, 0.76));
const radioWaves = union(circle(0.5, 0.62, 0.1), arc(0.5, 0.62, 0.22, 0.3, 200, 340), arc(0.5, 0.62, 0.4, 0.48, 205, 335), rect(0.46, 0.62, 0.54, 0.94));
const star = (cx, cy, r) => (x, y) => {
  const a = Math.atan2(y - cy, x - cx) + Math.PI / 2;
  const k = ((a / (2 * Math.PI)) * 5) % 1;
  const edge = r * (0.5 + 0.5 * Math.abs(1 - 2 * (k < 0 ? k + 1 : k)));
  return Math.hypot(x - cx, y - cy) <= edge;
};
const plus = (cx, cy, s, w) => union(rect(cx - s, cy - w, cx + s, cy + w), rect(cx - w, cy - s, cx + w, cy + s));
const refreshArrow = union(arc(0.5, 0.52, 0.26, 0.38, 300, 230), triangle(0.62, 0.04, 0.94, 0.3, 0.6, 0.42));
const magnifier = union(ring(0.42, 0.42, 0.2, 0.3), thickLine(0.62, 0.62, 0.88, 0.88, 0.16));

const C = {
  blue: [40, 100, 200, 255], navy: [30, 50, 110, 255], yellow: [236, 180, 50, 255], grey: [90, 96, 110, 255],
  dark: [50, 50, 60, 255], purple: [130, 70, 170, 255], green: [40, 150, 80, 255], red: [200, 50, 50, 255],
  white: [255, 255, 255, 255], orange: [235, 120, 30, 255], teal: [20, 130, 140, 255], slate: [100, 130, 170, 255],
};

const drawings = {
  genmusic: [[C.blue, note]],
  gencategory: [[C.yellow, folder]],
  class_album: [[C.dark, disc], [C.slate, ring(0.5, 0.5, 0.18, 0.24)]],
  class_artist: [[C.purple, person]],
  class_genre: [[C.green, bars]],
  class_random100: [[C.red, die], [C.white, dieDots]],
  class_latestalbum: [[C.dark, disc], [C.orange, star(0.76, 0.26, 0.26)]],
  container: [[C.slate, folder]],
  playlist: [[C.blue, listLines], [C.navy, union(circle(0.72, 0.8, 0.12), rect(0.78, 0.3, 0.84, 0.8))]],
  smartpls: [[C.blue, listLines], [C.orange, star(0.76, 0.72, 0.26)]],
  mediaserver: [[C.teal, server], [C.white, serverLights]],
  inetradio: [[C.orange, radioWaves]],
  refresh: [[C.green, refreshArrow]],
  new_playlist: [[C.blue, listLines], [C.green, plus(0.74, 0.74, 0.22, 0.07)]],
  search_dms: [[C.teal, magnifier]],
  new_station: [[C.orange, radioWaves], [C.green, plus(0.78, 0.24, 0.2, 0.065)]],
};

// --- PNG writer -------------------------------------------------------------------------------------
const crcTable = Array.from({ length: 256 }, (_, n) => {
  let c = n;
  for (let k = 0; k < 8; k++) c = c & 1 ? 0xedb88320 ^ (c >>> 1) : c >>> 1;
  return c >>> 0;
});
const crc32 = (buf) => {
  let c = 0xffffffff;
  for (const b of buf) c = crcTable[(c ^ b) & 0xff] ^ (c >>> 8);
  return (c ^ 0xffffffff) >>> 0;
};
const chunk = (type, data) => {
  const len = Buffer.alloc(4);
  len.writeUInt32BE(data.length);
  const body = Buffer.concat([Buffer.from(type, "ascii"), data]);
  const crc = Buffer.alloc(4);
  crc.writeUInt32BE(crc32(body));
  return Buffer.concat([len, body, crc]);
};
function png(size, layers) {
  const ss = 4;
  const raw = Buffer.alloc((size * 4 + 1) * size);
  for (let py = 0; py < size; py++) {
    raw[py * (size * 4 + 1)] = 0; // filter: none
    for (let px = 0; px < size; px++) {
      let [r, g, b, a] = [0, 0, 0, 0];
      for (let sy = 0; sy < ss; sy++)
        for (let sx = 0; sx < ss; sx++) {
          const x = (px + (sx + 0.5) / ss) / size, y = (py + (sy + 0.5) / ss) / size;
          let col = null;
          for (const [colour, shape] of layers) if (shape(x, y)) col = colour;
          if (col) { r += col[0]; g += col[1]; b += col[2]; a += col[3]; }
        }
      const n = ss * ss, cover = a / 255;
      const o = py * (size * 4 + 1) + 1 + px * 4;
      raw[o] = cover ? Math.round(r / cover) : 0;
      raw[o + 1] = cover ? Math.round(g / cover) : 0;
      raw[o + 2] = cover ? Math.round(b / cover) : 0;
      raw[o + 3] = Math.round(a / n);
    }
  }
  const ihdr = Buffer.alloc(13);
  ihdr.writeUInt32BE(size, 0);
  ihdr.writeUInt32BE(size, 4);
  ihdr[8] = 8; ihdr[9] = 6; // 8-bit RGBA
  return Buffer.concat([Buffer.from([137, 80, 78, 71, 13, 10, 26, 10]), chunk("IHDR", ihdr),
    chunk("IDAT", deflateSync(raw, { level: 9 })), chunk("IEND", Buffer.alloc(0))]);
}

// The classic 1x1 transparent GIF89a.
const blankGif = Buffer.from("R0lGODlhAQABAIAAAAAAAP///yH5BAEAAAAALAAAAAABAAEAAAIBRAA7", "base64");

const out = (path, data) => {
  const full = join(root, path);
  mkdirSync(dirname(full), { recursive: true });
  writeFileSync(full, data);
};
out("s.gif", blankGif);
for (const name of ["genmusic", "gencategory", "class_album", "class_artist", "class_genre", "class_random100",
  "class_latestalbum", "container", "playlist", "smartpls", "mediaserver", "inetradio"])
  out(`files_class/icon_${name}.png`, png(16, drawings[name]));
for (const name of ["refresh", "new_playlist", "search_dms", "new_station"])
  out(`button/btn_${name}.png`, png(16, drawings[name]));
for (const name of ["genmusic", "gencategory", "class_album", "class_artist", "class_genre", "class_random100",
  "class_latestalbum", "inetradio"])
  out(`thumb/thumb_${name}.png`, png(64, drawings[name]));
// The page's own mark, shown in its header.
out("harmona.png", png(32, [[C.blue, circle(0.5, 0.5, 0.48)], [C.white, note]]));
