// A Profile service on the npm package "soap", from the project's WSDL. Usage: node server.js WSDL
// Keeps one profile in memory. Prints "listening on http://127.0.0.1:PORT" when it is ready, and runs until it is stopped.
const fs = require('fs');
const http = require('http');
const soap = require('soap');

const wsdlPath = process.argv[2];
let profile = null;

function stored() {
  if (profile === null)
    throw { Fault: { faultcode: 'SOAP-ENV:Client', faultstring: 'no such profile', statusCode: 500 } };
  return profile;
}

// Attributes that the parser keeps beside a text value would be written back as elements.
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
  return Object.fromEntries(Object.entries(document).map(([key, value]) =>
    COMMON.has(key) ? [`protocol:${key}`, common(value)] : [key, value]));
}

const port = {
  create: (request) => answer((profile = { thisURI: ['urn:other:1'], ...plain(request) })),
  get: () => answer(stored()),
  set: (request) => answer((profile = { ...stored(), ...plain(request) })),
  add: (request) => {
    const contacts = [].concat(stored().contact || [], plain(request).contact || []);
    return answer((profile = { ...profile, contact: contacts }));
  },
  refreshCredentials: (request) =>
    answer((profile = { ...stored(), credentials: [{ ...plain(request).credentials, state: 'valid' }] })),
  remove: () => {
    const removed = stored();
    profile = null;
    return answer(removed);
  },
};

const server = http.createServer((request, response) => response.writeHead(404).end());
server.listen(0, '127.0.0.1', () => {
  const path = '/zuv/v1.0/services/Profile';
  const wsdl = fs.readFileSync(wsdlPath, 'utf8');
  soap.listen(server, {
    path,
    services: { [serviceName(wsdl)]: Object.fromEntries(portNames(wsdl).map((name) => [name, port])) },
    xml: wsdl,
    uri: wsdlPath,
    callback: () => console.log(`listening on http://127.0.0.1:${server.address().port}`),
  });
});

function serviceName(wsdl) {
  return /<wsdl:service name="(\w+)"/.exec(wsdl)[1];
}
function portNames(wsdl) {
  return [...wsdl.matchAll(/<wsdl:port name="(\w+)"/g)].map((match) => match[1]);
}
