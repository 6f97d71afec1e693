// All five ports on the npm package "soap", from the project's WSDLs.
//
// Usage: node server.js SCHEMA_DIR [--soap12]. Keeps documents in memory. Prints "listening on http://127.0.0.1:PORT" when it
// is ready, and runs until it is stopped. The stack reads both SOAP versions and answers in one, SOAP 1.1 by default.
const crypto = require('crypto');
const fs = require('fs');
const http = require('http');
const path = require('path');
const soap = require('soap');

const [schemas, version] = process.argv.slice(2);
const soap12 = version === '--soap12';
const documents = new Map(); // by name
const list = (value) => [].concat(value ?? []);
const fresh = () => `urn:other:${crypto.randomUUID()}`;

// The name of a derived type as an attribute, with its namespace, which the stack doesn't declare.
const typed = (type) =>
  ({ attributes: { 'xmlns:xsi': 'http://www.w3.org/2001/XMLSchema-instance', 'xsi:type': type } });

// Values without the attributes that the parser keeps with them, which would be written back as elements: all but the
// name of a derived type.
function plain(value) {
  if (Array.isArray(value)) return value.map(plain);
  if (value instanceof Date) return value.toISOString();
  if (value === null || typeof value !== 'object') return value;
  if ('$value' in value) return value.$value;
  const { attributes, ...members } = value;
  const type = attributes?.['xsi:type'];
  const kept = Object.fromEntries(Object.entries(members).map(([k, v]) => [k, plain(v)]));
  return type === undefined ? kept : { ...typed(type), ...kept };
}

// The stack puts an element that the schema takes over by reference into the referring namespace, so the names of the
// common namespace are given in full.
const COMMON = new Set(['identity', 'contact', 'credentials', 'subject', 'attachment']);
const NESTED = new Set(['profile']);

function common(value) {
  if (Array.isArray(value)) return value.map(common);
  if (value === null || typeof value !== 'object') return value;
  return Object.fromEntries(Object.entries(value).map(([key, item]) => [`protocol:${key}`, common(item)]));
}

function answer(document) {
  return Object.fromEntries(Object.entries(document).map(([key, value]) => {
    if (NESTED.has(key)) return [key, list(value).map(answer)];
    return COMMON.has(key) ? [`protocol:${key}`, common(value)] : [key, value];
  }));
}

function notFound(uri) {
  const detail = { 'protocol:Client.ObjectNotFound': { 'protocol:uri': uri } };
  const text = `no document has the name ${uri}`;
  const fault = soap12
    ? { Code: { Value: 'soap:Sender' }, Reason: { Text: { attributes: { 'xml:lang': 'en' }, $value: text } }, Detail: detail }
    : { faultcode: 'soap:Client', faultstring: text, detail };
  return { Fault: { ...fault, statusCode: soap12 ? 400 : 500 } };
}

// Operations. Members of documents are in the order of the schema.

// Keeps `made(request)` under a new name.
const keeping = (made) => async (request) => {
  const document = { thisURI: [fresh()], ...made(plain(request ?? {})) };
  documents.set(document.thisURI[0], document);
  return answer(document);
};

// Puts `change(held, request)` in the place of the document that the header names, or nothing.
const changing = (change, last = false) => async (request, callback, headers) => {
  const uri = headers?.header?.targetURI;
  if (!documents.has(uri)) throw notFound(uri);
  const document = change(documents.get(uri), plain(request ?? {}));
  if (last) documents.delete(uri);
  else documents.set(uri, document);
  return answer(document);
};

const get = changing((held) => held);
const ending = (state) => changing((held) => ({ ...held, state }));
const remove = changing((held) => ({ ...held, state: 'closed' }), true);

const attach = changing((held, request) => {
  const attachment = request.attachment ?? {};
  const offer = { state: 'open', dataURI: `${address()}/data/${crypto.randomUUID()}`, direction: 'in', transport: 'HTTP' };
  const taken = 'data' in attachment
    ? { thisURI: fresh(), state: 'complete', ...attachment }
    : { thisURI: fresh(), state: 'pending', ...attachment, dataPort: [offer] };
  return { ...held, attachment: [...list(held.attachment), taken] };
});
const attachStatus = changing((held, { attachmentURI, percentComplete }) => ({
  ...held,
  attachment: list(held.attachment).map((one) =>
    one.thisURI === attachmentURI && Number(percentComplete) === 100 ? { ...one, state: 'complete' } : one),
}));

const submitted = ({ thisURI, state, ...report }) =>
  ({ state: list(report.attachment).some((one) => one.state === 'pending') ? 'processing' : 'complete', ...report });
const submitAgain = changing((held, report) => ({ thisURI: held.thisURI, ...submitted(report) }));

function ordered(order) {
  const updateIdExpansion = list(order.updateId);
  return { state: 'complete.available', ...order, updateIdExpansion,
    attachment: updateIdExpansion.map((id) => ({ state: 'pending', reference: [id], dataURI: `${address()}/data/${id}` })) };
}

const ports = {
  Profile: {
    create: keeping((profile) => profile),
    get,
    set: changing((held, profile) => ({ thisURI: held.thisURI, ...profile })),
    add: changing((held, { contact }) => ({ ...held, contact: [...list(held.contact), ...list(contact)] })),
    refreshCredentials: changing((held, { credentials }) =>
      ({ ...held, credentials: [{ state: 'valid', ...credentials, token: crypto.randomUUID() }] })),
    remove: changing((held) => held, true),
  },
  InventoryReport: { get, submit: keeping(submitted), close: ending('closed'), cancel: ending('cancelled'), remove },
  StatusReport: {
    create: keeping((report) => ({ state: 'open', ...report })),
    get, submit: submitAgain, close: ending('closed'), cancel: ending('cancelled'), attach, attachStatus, remove,
  },
  UpdateOrder: {
    get, submit: keeping(ordered), close: ending('closed'), cancel: ending('cancelled'), remove,
    authenticate: async ({ credentials: { username, password } }) => {
      const success = username === 'ada' && password === 'sesame';
      return { credentials: common({ state: success ? 'valid' : 'invalid', username }), success };
    },
  },
  ProblemReport: {
    get, attach, attachStatus, remove,
    submit: keeping((report) => ({ state: 'open', ...report, answer: [{
      ...typed('protocolProblemReport:Answer.Server.Administration.Acknowledgment'), description: 'noted & filed' }] })),
  },
};

// The answer's header names the exchange as the request did.
function header(method, args, headers) {
  const id = headers?.header?.transactionId;
  return id === undefined ? '' : `<protocol:header><protocol:transactionId>${id}</protocol:transactionId></protocol:header>`;
}

// The data ports take any data.
const server = http.createServer((request, response) => {
  const status = request.url.startsWith('/data/') ? 200 : 404;
  request.resume().on('end', () => response.writeHead(status, { 'Content-Length': 0 }).end());
});
const address = () => `http://127.0.0.1:${server.address().port}`;

server.listen(0, '127.0.0.1', async () => {
  for (const [name, port] of Object.entries(ports)) {
    const wsdl = path.join(schemas, name.toLowerCase(), `${name}.wsdl`);
    await new Promise((ready) => {
      soap.listen(server, {
        path: `/zuv/v1.0/services/${name}`,
        services: { [name]: { [`${name}Soap`]: port, [`${name}Soap12`]: port } },
        xml: fs.readFileSync(wsdl, 'utf8'),
        uri: wsdl,
        forceSoap12Headers: soap12,
        callback: ready,
      }).addSoapHeader(header);
    });
  }
  console.log(`listening on ${address()}`);
});
