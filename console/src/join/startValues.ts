import type { DomainState } from '../api/types';
import { checkKdc, emptyForm, type JoinForm } from './rules';

// What the dialog shows at first: nothing, or for a member what it joined with. The domain's names are left out, as they
// are those of the domain of now, and found by themselves.
export function startValues(state: DomainState | undefined): JoinForm {
  if (state === undefined || !state.enable_domain) return emptyForm;
  const advanced = state.advance_domain_conf;
  const { kdc, register_nics: nics } = advanced;
  return {
    ...emptyForm,
    domain: advanced.fqdn_name === '' ? state.domain_name : advanced.fqdn_name.toLowerCase(),
    dns: state.dns.split(',').join(', '),
    trusted: state.manage_mode === 0,
    ...(advanced.enable_advance_option
      ? {
          kdc: checkKdc(kdc) === null ? kdc : '',
          nics: nics.includes('all') || nics.length === 0 ? null : nics,
        }
      : {}),
  };
}
