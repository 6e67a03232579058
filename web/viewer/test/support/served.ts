// The program's own server, over a folder.
import { type ChildProcess, spawn } from "node:child_process";
import { once } from "node:events";
import { createInterface } from "node:readline";

export class Served {
  url = "";
  private process: ChildProcess | undefined;

  /** Without a slash at its end, `url` is where it listens then. */
  async start(...named: string[]): Promise<string> {
    const program = process.env["ZMCRASTER"] as string;
    this.process = spawn(program, ["serve", "--port", "0", "-q", ...named], { stdio: ["ignore", "pipe", "inherit"] });
    const [line] = (await once(
      createInterface(this.process.stdout as NonNullable<ChildProcess["stdout"]>),
      "line",
    )) as [string];
    this.url = line.replace(/\/$/, "");
    return this.url;
  }

  async stop(): Promise<void> {
    if (this.process?.exitCode !== null) return;
    this.process.kill("SIGTERM");
    await once(this.process, "exit");
  }
}
