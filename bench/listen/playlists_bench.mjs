// The playlist actions of library.cgi, measured in the same run as the listing of the Bench folder
// (10,000 tracks): a smart playlist of that folder listed, and the changes the page makes to a
// personal and a shared playlist of 100 tracks. Each as a median over `rounds`, with its ratio to
// library.cgi's listing of the folder.
const median = (values) => [...values].sort((a, b) => a - b)[Math.floor(values.length / 2)];

export async function measurePlaylists({ base, auth, rounds, folderNode, listMedian }) {
  const request = async (params, method) => {
    const start = performance.now();
    const url = new URL("webapi/library.cgi", base);
    const body = new URLSearchParams(params);
    const response = method === "GET"
      ? await fetch(`${url}?${body}`, { headers: { Authorization: auth } })
      : await fetch(url, { method: "POST", body, headers: { Authorization: auth } });
    const text = await response.text();
    const reply = JSON.parse(text);
    if (!response.ok || reply.success !== true) throw new Error(`${params.action}: HTTP ${response.status} ${text.slice(0, 200)}`);
    return { ms: performance.now() - start, reply };
  };
  const folder = (await request({ action: "list", node: folderNode }, "GET")).reply;
  const streams = folder.tracks.slice(0, 100).map((t) => t.stream).join(",");
  const results = {};
  const add = (name, ms) => (results[name] ??= []).push(ms);

  await request({ action: "smartsave", category: "personal", name: "Bench smart", path: "Bench" });
  for (let i = 0; i < rounds; i++) {
    const smart = await request({ action: "list", node: "musiclib_music_personal/smart/Bench smart" }, "GET");
    add("smart playlist list (path=Bench, ~10,000 tracks)", smart.ms);
    if (smart.reply.tracks.length < 9000) throw new Error(`the smart playlist listed ${smart.reply.tracks.length} tracks`);
    for (const category of ["personal", "shared"]) {
      const made = await request({ action: "plcreate", category, name: `Bench ${category} ${i}` });
      add(`${category}: plcreate`, made.ms);
      const node = made.reply.node;
      add(`${category}: pladd 100 tracks`, (await request({ action: "pladd", node, streams })).ms);
      add(`${category}: plmove`, (await request({ action: "plmove", node, from: 0, to: 99 })).ms);
      add(`${category}: plremove`, (await request({ action: "plremove", node, entries: "5" })).ms);
      const renamed = await request({ action: "plrename", node, name: `Bench ${category} ${i} renamed` });
      add(`${category}: plrename`, renamed.ms);
      add(`${category}: pldelete`, (await request({ action: "pldelete", node: renamed.reply.node })).ms);
    }
    add("smartsave (a rule changed)", (await request({ action: "smartsave", category: "personal", old: "Bench smart", name: "Bench smart", path: "Bench", limit: String(10000 - i) })).ms);
  }
  await request({ action: "smartdelete", node: "musiclib_music_personal/smart/Bench smart" });
  return Object.entries(results).map(([name, values]) =>
    `${name.padEnd(44)} median ${median(values).toFixed(1).padStart(7)} ms  ` +
    `min ${Math.min(...values).toFixed(1).padStart(7)} ms  x${(median(values) / listMedian).toFixed(2)} of the listing`);
}
