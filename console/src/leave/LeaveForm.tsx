import { Checkbox } from '@patternfly/react-core/dist/esm/components/Checkbox';
import { Form } from '@patternfly/react-core/dist/esm/components/Form';
import { Failure } from '../join/Failure';
import type { Job } from '../join/job';
import { problemText } from '../join/problemText';
import { checkPassword, checkUser } from '../join/rules';
import { t } from '../texts';
import { TextField } from '../ui';
import './leave.css';

export interface LeaveValues {
  deleteAccount: boolean;
  user: string;
  password: string;
  // What was typed as the domain's name.
  confirm: string;
}

export const emptyLeave: LeaveValues = { deleteAccount: false, user: '', password: '', confirm: '' };

export type LeaveField = 'user' | 'password' | 'confirm';

// What keeps the form from being sent, by field, in the order of the fields.
export function leaveProblems(values: LeaveValues, domain: string): Partial<Record<LeaveField, string>> {
  const user = values.deleteAccount ? problemText(checkUser(values.user)) : null;
  const password = values.deleteAccount ? problemText(checkPassword(values.password)) : null;
  const confirmed = values.confirm.trim().toLowerCase() === domain.toLowerCase();
  return {
    ...(user === null ? {} : { user }),
    ...(password === null ? {} : { password }),
    ...(confirmed ? {} : { confirm: t('leave.confirm.wrong') }),
  };
}

interface LeaveFormProps {
  id: string;
  domain: string;
  account: string | null;
  values: LeaveValues;
  onChange: (part: Partial<LeaveValues>) => void;
  problems: Partial<Record<LeaveField, string>>;
  insist: boolean;
  onSubmit: () => void;
  failure: Extract<Job, { state: 'failed' }> | null;
}

export function LeaveForm(props: LeaveFormProps) {
  const { id, domain, values, onChange, problems, insist, failure } = props;
  const account = props.account ?? t('leave.account.unnamed');
  return (
    <Form
      id={id}
      noValidate
      autoComplete="off"
      onSubmit={(event) => {
        event.preventDefault();
        props.onSubmit();
      }}
    >
      {failure !== null && <Failure key={String(failure.record?.id)} job={failure} />}
      <div>
        <p>{t('leave.what')}</p>
        <ul className="vorn-leave__effects">
          <li>{t('leave.what.users')}</li>
          <li>{t('leave.what.lists')}</li>
          <li>{t('leave.what.workgroup')}</li>
          {!values.deleteAccount && <li>{t('leave.what.account', { account })}</li>}
        </ul>
      </div>
      <Checkbox
        id="leave-delete"
        label={t('leave.delete', { account })}
        description={t('leave.delete.hint')}
        isChecked={values.deleteAccount}
        onChange={(_event, deleteAccount) => onChange({ deleteAccount })}
      />
      {values.deleteAccount && (
        <div className="vorn-leave__credentials">
          <TextField
            id="leave-user"
            label={t('join.account')}
            required
            value={values.user}
            onChange={(user) => onChange({ user })}
            problem={problems.user ?? null}
            insist={insist}
          />
          <TextField
            id="leave-password"
            label={t('join.password')}
            required
            password
            autoComplete="new-password"
            value={values.password}
            onChange={(password) => onChange({ password })}
            problem={problems.password ?? null}
            insist={insist}
          />
        </div>
      )}
      <TextField
        id="leave-confirm"
        label={t('leave.confirm', { domain })}
        required
        value={values.confirm}
        onChange={(confirm) => onChange({ confirm })}
        problem={values.confirm === '' && !insist ? null : (problems.confirm ?? null)}
        insist={insist}
      />
    </Form>
  );
}
