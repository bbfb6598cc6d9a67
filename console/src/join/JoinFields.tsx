import { FormGroup, FormHelperText } from '@patternfly/react-core/dist/esm/components/Form';
import { HelperText, HelperTextItem } from '@patternfly/react-core/dist/esm/components/HelperText';
import { Switch } from '@patternfly/react-core/dist/esm/components/Switch';
import { t } from '../texts';
import { TextField } from '../ui';
import { problemText } from './problemText';
import type { Field, JoinForm, Problem } from './rules';

export interface FieldsProps {
  form: JoinForm;
  onChange: (change: Partial<JoinForm>) => void;
  problems: Partial<Record<Field, Problem>>;
  // Show what is wrong at once: the administrator has tried to go on.
  insist: boolean;
}

// What every join needs.
export function JoinFields({ form, onChange, problems, insist }: FieldsProps) {
  return (
    <>
      <TextField
        id="join-domain"
        label={t('join.domain')}
        hint={t('join.domain.hint')}
        required
        value={form.domain}
        onChange={(domain) => onChange({ domain })}
        problem={problemText(problems.domain)}
        insist={insist}
      />
      <TextField
        id="join-user"
        label={t('join.account')}
        hint={t('join.account.hint')}
        required
        autoComplete="off"
        value={form.user}
        onChange={(user) => onChange({ user })}
        problem={problemText(problems.user)}
        insist={insist}
      />
      <TextField
        id="join-password"
        label={t('join.password')}
        required
        password
        autoComplete="new-password"
        value={form.password}
        onChange={(password) => onChange({ password })}
        problem={problemText(problems.password)}
        insist={insist}
      />
      <TextField
        id="join-dns"
        label={t('join.dns')}
        hint={t('join.dns.hint')}
        value={form.dns}
        onChange={(dns) => onChange({ dns })}
        problem={problemText(problems.dns)}
        insist={insist}
      />
      <FormGroup fieldId="join-trusted" label={t('overview.trusted')} hasNoPaddingTop>
        <Switch
          id="join-trusted"
          label={t('join.trusted')}
          isChecked={form.trusted}
          onChange={(_event, trusted) => onChange({ trusted })}
          aria-describedby="join-trusted-helper"
        />
        <FormHelperText id="join-trusted-helper">
          <HelperText>
            <HelperTextItem>{t('join.trusted.hint')}</HelperTextItem>
          </HelperText>
        </FormHelperText>
      </FormGroup>
    </>
  );
}
