// An OPC UA server for the client's end-to-end tests and benchmark, on node-opcua: an
// implementation that owes nothing to ours. It listens on 127.0.0.1 (port from argv[2], 0 for
// a free one; argv[3] the secure channel lifetime in ms), prints "ENDPOINT opc.tcp://127.0.0.1:PORT" once it listens, and takes commands
// on standard input, one a line, answering each with "OK <command>":
//   stop          stops listening (sessions and connections go)
//   start         listens again on the same port
//   silent MS     answers nothing for MS ms: connections stay open and new ones are
//                 accepted by the system, but nothing is read or sent
//   lifetime MS   revises the lifetime of secure channels opened from now on to MS
//   set NAME V    sets a variable (JSON value)
//   bench N MS    N extra Double variables "ns=1;s=Bench.K", each changing every MS ms
//   quit          exits
const opcua = require("node-opcua");
const readline = require("readline");

const requestedPort = Number(process.argv[2] || 0);
const ns = "urn:maroset:test";
let server = null;
let port = requestedPort;
let lifetime = Number(process.argv[3] || 0);
const values = {};
const ticking = [];
let setValue = null;

function variables(namespace, folder) {
    const D = opcua.DataType;
    const add = (name, dataType, value, options = {}) => {
        const arrayType = options.array ? opcua.VariantArrayType.Array : opcua.VariantArrayType.Scalar;
        values[name] = namespace.addVariable({
            componentOf: folder,
            browseName: name,
            nodeId: `s=${name}`,
            dataType,
            valueRank: options.array ? 1 : -1,
            minimumSamplingInterval: 10,
            accessLevel: options.readOnly ? "CurrentRead" : "CurrentRead | CurrentWrite",
            userAccessLevel: options.readOnly ? "CurrentRead" : "CurrentRead | CurrentWrite",
            value: new opcua.Variant({ dataType, arrayType, value }),
        });
        values[name].maroset = { dataType, arrayType };
    };
    const set = (name, value) => {
        const { dataType, arrayType } = values[name].maroset;
        values[name].setValueFromSource(new opcua.Variant({ dataType, arrayType, value }));
    };
    setValue = set;
    add("Boolean", D.Boolean, true);
    add("SByte", D.SByte, -5);
    add("Byte", D.Byte, 200);
    add("Int16", D.Int16, -1234);
    add("UInt16", D.UInt16, 60000);
    add("Int32", D.Int32, -100000);
    add("UInt32", D.UInt32, 4000000000);
    add("Int64", D.Int64, [0x1, 0x2]);  // 4294967298
    add("UInt64", D.UInt64, [0x0, 0x7]);
    add("Float", D.Float, 1.5);
    add("Double", D.Double, 3.25);
    add("String", D.String, "Grüße");
    add("LocalizedText", D.LocalizedText, new opcua.LocalizedText({ text: "Hello", locale: "en" }));
    add("DateTime", D.DateTime, new Date(Date.UTC(2024, 0, 2, 3, 4, 5)));
    add("ReadOnly", D.Int32, 42, { readOnly: true });
    add("DoubleArray", D.Double, new Float64Array([1.5, 2.5, 3.5]), { array: true });
    add("Int32Array", D.Int32, new Int32Array([1, 2, 3, 4]), { array: true });
    // 20000 Doubles: 160 kB, far more than one 64 kB chunk.
    add("LargeArray", D.Double, new Float64Array(20000).map((_, i) => i), { array: true });
    add("Counter", D.Int32, 0, { readOnly: true });
    let counter = 0;
    ticking.push(setInterval(() => set("Counter", ++counter), 100));
}

function bench(count, ms) {
    const namespace = server.engine.addressSpace.getNamespace(ns);
    const nodes = [];
    for (let k = 0; k < count; ++k) {
        nodes.push(namespace.addVariable({
            organizedBy: server.engine.addressSpace.rootFolder.objects,
            browseName: `Bench.${k}`,
            nodeId: `s=Bench.${k}`,
            dataType: opcua.DataType.Double,
            minimumSamplingInterval: 10,
            value: new opcua.Variant({ dataType: opcua.DataType.Double, value: 0 }),
        }));
    }
    let n = 0;
    ticking.push(setInterval(() => {
        ++n;
        for (const node of nodes) node.setValueFromSource(new opcua.Variant({ dataType: opcua.DataType.Double, value: n }));
    }, ms));
}

async function start() {
    server = new opcua.OPCUAServer({
        port,
        hostname: "127.0.0.1",
        alternateHostname: ["127.0.0.1"],
        securityPolicies: [opcua.SecurityPolicy.None],
        securityModes: [opcua.MessageSecurityMode.None],
        allowAnonymous: true,
        maxConnections: 50,
        serverCapabilities: { maxSessions: 50 },
        buildInfo: { productName: "maroset-test-server" },
        defaultSecureTokenLifetime: lifetime || undefined,
    });
    await server.initialize();
    const namespace = server.engine.addressSpace.registerNamespace(ns);
    const folder = namespace.addFolder(server.engine.addressSpace.rootFolder.objects, { browseName: "Maroset" });
    variables(namespace, folder);
    await server.start();
    port = server.endpoints[0].port;
    console.log(`ENDPOINT opc.tcp://127.0.0.1:${port}`);
}

async function stop() {
    if (!server) return;
    const s = server;
    server = null;
    await s.shutdown(0);
    for (const t of ticking) clearInterval(t);
    ticking.length = 0;
}

// The whole process stops for a while, without using the processor.
function freeze(ms) {
    Atomics.wait(new Int32Array(new SharedArrayBuffer(4)), 0, 0, ms);
}

const commands = readline.createInterface({ input: process.stdin });
commands.on("line", async (line) => {
    const [cmd, ...args] = line.trim().split(/\s+/);
    try {
        await ready;
        if (cmd === "stop") await stop();
        else if (cmd === "start") { if (!server) await start(); }
        else if (cmd === "silent") setTimeout(() => freeze(Number(args[0])), 50);
        else if (cmd === "lifetime") {
            lifetime = Number(args[0]);
            for (const ep of server.endpoints) ep.defaultSecureTokenLifetime = lifetime;
        } else if (cmd === "set") setValue(args[0], JSON.parse(args.slice(1).join(" ")));
        else if (cmd === "bench") bench(Number(args[0]), Number(args[1]));
        else if (cmd === "quit") { await stop(); process.exit(0); }
        console.log(`OK ${line.trim()}`);
    } catch (e) {
        console.log(`ERROR ${line.trim()}: ${e.message}`);
    }
});
commands.on("close", async () => { await stop(); process.exit(0); });

const ready = start().catch((e) => { console.error(e); process.exit(1); });
