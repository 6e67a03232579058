// A web server of a test's own: it writes down each request, and fails as it is told to.
import { createServer, type IncomingMessage, type Server as HttpServer, type ServerResponse } from "node:http";
import type { AddressInfo } from "node:net";

export class Server {
  /** The ranges asked for, first and last byte, in the order of the requests; [] for a request without one. */
  readonly log: number[][] = [];
  /** `If-Range` of each request. */
  readonly validators: (string | undefined)[] = [];
  bytes: Uint8Array = new Uint8Array(0);
  etag: string | undefined = '"1"';
  modified: string | undefined = "Sat, 21 Nov 2026 10:00:00 GMT";
  ranges = true;
  /** Statuses of the next requests, answered in place of the file; 0: as usual; -1: the connection breaks. */
  readonly statuses: number[] = [];
  /** Bytes that the next answers lack at their end. */
  readonly short: number[] = [];
  contentRange = true;
  contentLength = true;
  ended = 0; // answers whose client went before their end
  mostAtOnce = 0;
  private atOnce = 0;
  private held: (() => void)[] | undefined;
  private readonly server: HttpServer = createServer((request, response) => this.answer(request, response));

  async start(): Promise<string> {
    await new Promise<void>((resolve) => this.server.listen(0, "127.0.0.1", resolve));
    return `http://127.0.0.1:${(this.server.address() as AddressInfo).port}/scene.pyr`;
  }

  stop(): void {
    this.release();
    this.server.close();
    this.server.closeAllConnections();
  }

  /** Answers wait until `release`. */
  hold(): void {
    this.held ??= [];
  }

  release(): void {
    const waiting = this.held ?? [];
    this.held = undefined;
    for (const go of waiting) go();
  }

  /** Once so many requests have come. */
  async requests(count: number): Promise<void> {
    while (this.log.length < count) await new Promise((resolve) => setTimeout(resolve, 2));
  }

  private answer(request: IncomingMessage, response: ServerResponse): void {
    const match = /^bytes=(\d+)-(\d+)$/.exec(request.headers.range ?? "");
    this.log.push(match ? [Number(match[1]), Number(match[2])] : []);
    this.validators.push(request.headers["if-range"] as string | undefined);
    this.mostAtOnce = Math.max(this.mostAtOnce, ++this.atOnce);
    response.on("close", () => {
      this.atOnce--;
      if (!response.writableFinished) this.ended++;
    });
    const go = (): void => this.send(match, request, response);
    if (this.held) this.held.push(go);
    else go();
  }

  private send(match: RegExpExecArray | null, request: IncomingMessage, response: ServerResponse): void {
    const status = this.statuses.shift() ?? 0;
    if (status < 0) return void request.socket.destroy();
    if (status > 0) return void response.writeHead(status).end();
    if (this.etag) response.setHeader("ETag", this.etag);
    if (this.modified) response.setHeader("Last-Modified", this.modified);
    const validator = request.headers["if-range"];
    const same = validator === undefined || validator === this.etag || validator === this.modified;
    if (match && this.ranges && same) return this.sendPart(Number(match[1]), Number(match[2]), response);
    if (this.contentLength) response.setHeader("Content-Length", this.bytes.length);
    response.end(this.bytes);
  }

  private sendPart(first: number, last: number, response: ServerResponse): void {
    const size = this.bytes.length;
    if (first >= size) return void response.writeHead(416, { "Content-Range": `bytes */${size}` }).end();
    const end = Math.min(last + 1, size) - (this.short.shift() ?? 0);
    if (this.contentRange) response.setHeader("Content-Range", `bytes ${first}-${end - 1}/${size}`);
    response.writeHead(206, { "Content-Length": end - first }).end(this.bytes.subarray(first, end));
  }
}
