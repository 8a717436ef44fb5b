import{a,b,c,d}from"./ULE27ZYI.js";import"./JTCXYPTH.js";import"./NYMLT67K.js";import"./LRJEAXZW.js";export{d as css,b as cssCompletionSource,c as cssLanguage,a as defineCSSCompletionSource};
