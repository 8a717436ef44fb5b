import{a as e}from"./parts/A4K6PDTJ.js";import{$ as s,ba as a}from"./parts/NYMLT67K.js";import"./parts/LRJEAXZW.js";async function l(i,o){let n=await e(i);if(!n)return null;let r=[];return s(o,n.language.parser.parse(o),a,(p,t)=>r.push([p,t]),()=>r.push([`
`,""])),r}export{l as colour};
