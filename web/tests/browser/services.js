// The running system's services as the browser tests stop, hang and start them again: the
// processes of this system only (other systems on this machine run their own, in other mount
// namespaces), found by name among the processes that share this test's mount namespace.
import { readFileSync, readdirSync, readlinkSync, appendFileSync, openSync } from "node:fs";
import { spawn } from "node:child_process";
import { connect } from "node:net";
import { join } from "node:path";

const build = process.env.HARMONA_BUILD ?? "build";
const state = process.env.HARMONA_STATE ?? "/run/harmona-web";
const stack = readFileSync(new URL("../../../tests/harness/stack.sh", import.meta.url), "utf8");
const setting = (name) => stack.match(new RegExp(`^${name}=(\\S+)$`, "m"))[1];
const link = setting("HARMONA_STACK_LINK");
const mediadPort = Number(setting("HARMONA_MEDIAD_PORT"));
const daemonSocket = setting("HARMONA_DAEMON_SOCKET");
const ownMounts = readlinkSync("/proc/self/ns/mnt");

// The live processes of `name` in this system (a service may run more than one).
export function serviceProcesses(name) {
  const found = [];
  for (const entry of readdirSync("/proc")) {
    if (!/^\d+$/.test(entry)) continue;
    try {
      if (readlinkSync(`/proc/${entry}/ns/mnt`) !== ownMounts) continue;
      if (readFileSync(`/proc/${entry}/comm`, "utf8").trim() !== name.slice(0, 15)) continue;
      const stat = readFileSync(`/proc/${entry}/stat`, "utf8");
      if (stat.slice(stat.lastIndexOf(")") + 2, stat.lastIndexOf(")") + 3) === "Z") continue;
      found.push(Number(entry));
    } catch {
      // gone meanwhile
    }
  }
  return found;
}
// Sends `signal` to every process of `name`; throws when none runs.
function signal(name, signal) {
  const pids = serviceProcesses(name);
  if (pids.length === 0) throw new Error(`${name} is not running`);
  for (const pid of pids) process.kill(pid, signal);
  return pids;
}

const sleep = (ms) => new Promise((resolve) => setTimeout(resolve, ms));
async function until(what, test, ms = 15000) {
  for (const end = Date.now() + ms; Date.now() < end; await sleep(100)) if (await test()) return;
  throw new Error(`${what} within ${ms} ms`);
}
const connects = (options) => new Promise((resolve) => {
  const socket = connect(options, () => { socket.destroy(); resolve(true); });
  socket.on("error", () => resolve(false));
});

// Stops the service (SIGTERM) and waits until it is gone.
export async function stopService(name) {
  signal(name, "SIGTERM");
  await until(`${name} stopped`, () => serviceProcesses(name).length === 0);
}

// Starts the service again as the system started it, in a session of its own, and waits until it
// serves; the system stops it at its end (restarted.pids).
export async function startService(name) {
  const out = openSync(join(state, `${name}.restarted.out`), "a");
  const child = spawn(join(build, name), ["--interface", link], { detached: true, stdio: ["ignore", out, out] });
  child.unref();
  appendFileSync(join(state, "restarted.pids"), `${child.pid}\n`);
  if (name === "harmona-mediad") await until("harmona-mediad listening", () => connects({ host: "127.0.0.1", port: mediadPort }));
  else await until(`${name} listening`, () => connects({ path: daemonSocket }));
}

// Stops the service's process without ending it (SIGSTOP): it accepts connections but answers none.
export function hangService(name) {
  const pids = signal(name, "SIGSTOP");
  return () => {
    for (const pid of pids) process.kill(pid, "SIGCONT");
  };
}
