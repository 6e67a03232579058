// serve.cjs FOLDER: a store on a free port of this machine, with one bucket, "maps", that keeps its objects in a
// folder. Prints the port when it takes requests; ends with its standard input.
const { createRequire } = require("module");
const S3rver = createRequire(process.env.ZMC_STORE_TOOLS + "/package.json")("s3rver");

const store = new S3rver({
    address: "127.0.0.1",
    port: 0,
    silent: true,
    directory: process.argv[2],
    vhostBuckets: false,
    configureBuckets: [{ name: "maps" }],
});
store.run().then(({ port }) => console.log(port));
process.stdin.on("end", () => process.exit(0)).resume();
