// A Profile service on the npm package "soap", from the project's WSDL.
//
// Usage: node server.js WSDL [--soap12]. Keeps one profile in memory. Prints "listening on http://127.0.0.1:PORT" when it
// is ready, and runs until it is stopped. The stack reads both SOAP versions and answers in one, SOAP 1.1 unless told.
const crypto = require('crypto');
const fs = require('fs');
const http = require('http');
const soap = require('soap');

const [wsdlPath, version] = process.argv.slice(2);
const soap12 = version === '--soap12';
const PATH = '/zuv/v1.0/services/Profile';
const NAME = 'urn:other:1';
let profile = null;

// Values without the attributes that the parser keeps beside them, which would be written back as elements.
function plain(value) {
  if (Array.isArray(value)) return value.map(plain);
  if (value === null || typeof value !== 'object') return value;
  if ('$value' in value) return value.$value;
  return Object.fromEntries(Object.entries(value).filter(([key]) => key !== 'attributes').map(([k, v]) => [k, plain(v)]));
}

// The stack puts an element that the schema takes over by reference into the referring namespace, so the names of the
// common namespace are given in full.
const COMMON = new Set(['identity', 'contact', 'credentials']);

function common(value) {
  if (Array.isArray(value)) return value.map(common);
  if (value === null || typeof value !== 'object') return value;
  return Object.fromEntries(Object.entries(value).map(([key, item]) => [`protocol:${key}`, common(item)]));
}

function answer(document) {
  return Object.fromEntries(Object.entries(document).map(([key, value]) => {
    if (key === 'profile') return [key, [].concat(value).map(answer)];
    return COMMON.has(key) ? [`protocol:${key}`, common(value)] : [key, value];
  }));
}

function notFound(uri) {
  const detail = { 'protocol:Client.ObjectNotFound': { 'protocol:uri': uri } };
  const text = `no profile has the name ${uri}`;
  const fault = soap12
    ? { Code: { Value: 'soap:Sender' }, Reason: { Text: { attributes: { 'xml:lang': 'en' }, $value: text } }, Detail: detail }
    : { faultcode: 'soap:Client', faultstring: text, detail };
  return { Fault: { ...fault, statusCode: soap12 ? 400 : 500 } };
}

// The profile that the request's header names.
function target(headers) {
  const uri = headers?.header?.targetURI;
  if (profile === null || uri !== NAME) throw notFound(uri);
  return profile;
}

// The row of an operation that puts `change(held, request)` in the place of the profile held and answers with it.
const changing = (change) => async (request, callback, headers) =>
  answer((profile = change(target(headers), plain(request ?? {}))));

const port = {
  create: async (request) => answer((profile = { ...plain(request), thisURI: [NAME] })),
  get: async (request, callback, headers) => answer(target(headers)),
  set: changing((held, request) => ({ ...request, thisURI: held.thisURI })),
  add: changing((held, request) => ({ ...held, contact: [].concat(held.contact ?? [], request.contact ?? []) })),
  refreshCredentials: changing((held, request) =>
    ({ ...held, credentials: [{ ...request.credentials, state: 'valid', token: crypto.randomUUID() }] })),
  remove: async (request, callback, headers) => {
    const removed = target(headers);
    profile = null;
    return answer(removed);
  },
};

// The answer's header names the exchange as the request did.
function header(method, args, headers) {
  const id = headers?.header?.transactionId;
  return id === undefined ? '' : `<protocol:header><protocol:transactionId>${id}</protocol:transactionId></protocol:header>`;
}

const server = http.createServer((request, response) => response.writeHead(404).end());
server.listen(0, '127.0.0.1', () => {
  const service = soap.listen(server, {
    path: PATH,
    services: { Profile: { ProfileSoap: port, ProfileSoap12: port } },
    xml: fs.readFileSync(wsdlPath, 'utf8'),
    uri: wsdlPath,
    forceSoap12Headers: soap12,
    callback: () => console.log(`listening on http://127.0.0.1:${server.address().port}`),
  });
  service.addSoapHeader(header);
});
