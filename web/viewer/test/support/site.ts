// A web server of files in memory: it writes down what is asked for, waits and fails as it is told to.
import { createServer, type IncomingMessage, type Server, type ServerResponse } from "node:http";
import type { AddressInfo } from "node:net";

export interface Served {
  bytes: Uint8Array;
  type?: string;
  etag?: string;
  /** Whether other origins may read it, and see what a reader needs. */
  shared?: boolean;
}

export class Site {
  readonly files = new Map<string, Served>();
  /** What was asked for: the path, and the first byte of the range. */
  readonly log: { path: string; from: number }[] = [];
  /** Requests whose client went before their end. */
  left = 0;
  /** Decides on a request: a status in place of an answer, or the wish to wait for `release`. */
  judge: (path: string, from: number) => number | "wait" | undefined = () => undefined;
  private readonly held: (() => void)[] = [];
  private readonly server: Server = createServer((request, response) => this.answer(request, response));

  async start(): Promise<string> {
    await new Promise<void>((resolve) => this.server.listen(0, "127.0.0.1", resolve));
    return `http://127.0.0.1:${(this.server.address() as AddressInfo).port}`;
  }

  stop(): void {
    this.release();
    this.server.close();
    this.server.closeAllConnections();
  }

  release(): void {
    for (const go of this.held.splice(0)) go();
  }

  /** Requests for a file since the last call. */
  requests(path: string): number {
    const count = this.log.filter((each) => each.path === path).length;
    this.log.length = 0;
    return count;
  }

  private answer(request: IncomingMessage, response: ServerResponse): void {
    const path = decodeURIComponent(new URL(request.url as string, "http://x").pathname).slice(1);
    const range = /^bytes=(\d+)-(\d+)$/.exec(request.headers.range ?? "");
    const from = Number(range?.[1] ?? 0);
    this.log.push({ path, from });
    response.on("close", () => (this.left += Number(!response.writableFinished)));
    const verdict = this.judge(path, from);
    const go = (): void => this.send(path, range, request, response);
    if (typeof verdict === "number") response.writeHead(verdict).end();
    else if (verdict === "wait") this.held.push(go);
    else go();
  }

  private send(path: string, range: RegExpExecArray | null, request: IncomingMessage, response: ServerResponse): void {
    const file = this.files.get(path);
    if (!file) return void response.writeHead(404).end();
    const { bytes, type = "application/octet-stream", etag = '"1"', shared } = file;
    response.setHeader("Content-Type", type).setHeader("ETag", etag).setHeader("Cache-Control", "no-store");
    if (shared) {
      response.setHeader("Access-Control-Allow-Origin", "*");
      response.setHeader("Access-Control-Allow-Headers", "Range");
      response.setHeader("Access-Control-Expose-Headers", "Content-Range, ETag");
    }
    const validator = request.headers["if-range"];
    if (!range || (validator !== undefined && validator !== etag)) return void response.end(bytes);
    const [first, last] = [Number(range[1]), Math.min(Number(range[2]), bytes.length - 1)];
    if (first >= bytes.length)
      return void response.writeHead(416, { "Content-Range": `bytes */${bytes.length}` }).end();
    response.writeHead(206, { "Content-Range": `bytes ${first}-${last}/${bytes.length}` });
    response.end(bytes.subarray(first, last + 1));
  }
}
